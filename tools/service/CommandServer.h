#pragma once

#include <functional>
#include <thread>
#include <vector>

#include "PipeEnd.h"

namespace service {

// Takes commands from any number of clients, one message each. A client that sends nothing gets two seconds, and other
// clients do not wait for it.
class CommandServer {
  public:
    // `cancel` is called on the server's threads; it returns false when there is nothing to cancel.
    explicit CommandServer(std::function<bool()> cancel);
    CommandServer(const CommandServer&) = delete;
    CommandServer& operator=(const CommandServer&) = delete;
    ~CommandServer();

  private:
    void serve(PipeEnd& pipe);

    std::function<bool()> cancel_;
    tools::Handle stop_ = tools::createEvent();
    std::vector<std::thread> threads_;
};

} // namespace service
