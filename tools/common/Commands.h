#pragma once

#include <functional>
#include <optional>
#include <string>
#include <vector>

namespace tools {

using Arguments = std::vector<std::wstring>;

struct Command {
    const wchar_t* name;
    // The arguments, as a message about a wrong number of them shows them.
    const wchar_t* usage;
    std::size_t minArguments;
    std::size_t maxArguments;
    std::function<void(const Arguments&)> run;
};

// The commands that a program takes on its standard input, one a line of UTF-8: the name, a space, and the arguments
// with | between them.
class Commands {
  public:
    enum class Step { done, failed, endOfInput };

    explicit Commands(std::vector<Command> table);

    // Waits for the next line, prints it, runs it, and prints "done", or "failed: " and the reason.
    Step runNext();
    // Runs a command without printing it. Throws a Failure if there is no such command or if it fails.
    void run(const std::wstring& line) const;
    void run(const std::wstring& name, const Arguments& arguments) const;
    // Returns the arguments from `first` on as the line that they were split from.
    static std::wstring join(const Arguments& arguments, std::size_t first);

  private:
    std::optional<std::wstring> readLine();

    std::vector<Command> table_;
    std::string unread_;
};

} // namespace tools
