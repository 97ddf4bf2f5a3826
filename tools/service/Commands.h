#pragma once

#include <functional>
#include <string>
#include <thread>
#include <vector>

#include "PipeEnd.h"

namespace service {

// Takes commands from any number of clients, one message each. A client that says nothing is given two seconds and
// keeps nobody waiting.
class CommandServer {
  public:
    // `cancel` is called on the server's threads.
    explicit CommandServer(std::function<bool()> cancel);
    CommandServer(const CommandServer&) = delete;
    CommandServer& operator=(const CommandServer&) = delete;
    ~CommandServer();

  private:
    void serve(PipeEnd& pipe);

    std::function<bool()> cancel_;
    Handle stop_ = makeEvent();
    std::vector<std::thread> threads_;
};

} // namespace service
