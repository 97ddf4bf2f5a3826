#pragma once

#include <cstdint>
#include <deque>
#include <mutex>
#include <string>
#include <thread>
#include <vector>

#include "PipeEnd.h"

namespace service {

// Tells any number of clients what the service does. A client that comes late is first told how things stand; one that
// reads slowly is told in fewer messages with the same sums; one that takes nothing for ten seconds is dropped. Nobody
// waits for a client. Any thread.
class StatusServer {
  public:
    StatusServer();
    StatusServer(const StatusServer&) = delete;
    StatusServer& operator=(const StatusServer&) = delete;
    ~StatusServer();

    void send(std::uint32_t type, std::uint64_t value = 0, const std::wstring& text = {});
    void sendRaw(const std::string& frame);
    // Something that no honest service sends; false when the kind is not known.
    bool sendGarbage(const std::wstring& kind);
    static const std::vector<std::wstring>& garbageKinds();

  private:
    // A progress message keeps its parts until it is written, so that it can be merged with others.
    struct Outgoing {
        std::uint32_t type = 0;
        std::uint64_t value = 0;
        std::wstring text;
        std::string raw;
        unsigned repeat = 1;
        DWORD pause = 0;
        bool hangUp = false;
    };
    struct Client;

    void accept(std::unique_ptr<PipeEnd> next);
    void serve(Client& client);
    void post(const Outgoing& message);
    static void collapse(std::deque<Outgoing>& queue);
    void dropLeft(bool all);

    Handle stop_ = makeEvent();
    std::mutex mutex_;
    std::vector<std::unique_ptr<Client>> clients_;
    bool running_ = false;
    std::uint64_t total_ = 0;
    std::uint64_t done_ = 0;
    std::wstring item_;
    std::thread acceptor_;
};

} // namespace service
