#pragma once

#include <cstdint>
#include <deque>
#include <memory>
#include <mutex>
#include <string>
#include <thread>
#include <vector>

#include "PipeEnd.h"

namespace service {

// Tells any number of clients about the restore that runs. A client that connects later first gets the state so far.
// One that reads nothing for ten seconds, or leaves too much unread, is dropped. No caller waits for a client. Any
// thread.
class StatusServer {
  public:
    StatusServer();
    StatusServer(const StatusServer&) = delete;
    StatusServer& operator=(const StatusServer&) = delete;
    ~StatusServer();

    void send(std::uint32_t type, std::uint64_t value = 0, const std::wstring& text = {});
    // Sends something that no honest service sends. Throws a Failure when the kind is not known.
    void sendGarbage(const std::wstring& kind);
    // Sends each kind in turn.
    void sendNextGarbage();

  private:
    struct Client;
    struct Output {
        std::string bytes;
        unsigned repeat = 1;
        DWORD pauseMs = 0;
        bool hangUp = false;
    };
    struct Garbage {
        const wchar_t* kind;
        std::vector<Output> outputs;
    };

    static std::vector<Garbage> garbage();
    std::unique_ptr<PipeEnd> createPipe() const;
    void accept();
    void serve(Client& client);
    void post(const Output& output);
    void sendStateTo(Client& client) const;
    void dropGone();

    tools::Handle stop_ = tools::createEvent();
    // The instance that waits for a client; the acceptor's.
    std::unique_ptr<PipeEnd> next_;
    std::mutex mutex_;
    std::vector<std::unique_ptr<Client>> clients_;
    std::size_t garbageSent_ = 0;
    bool running_ = false;
    std::uint64_t total_ = 0;
    std::uint64_t done_ = 0;
    std::wstring item_;
    std::thread acceptor_;
};

} // namespace service
