#include "Commands.h"

#include <algorithm>
#include <exception>

#include <windows.h>

#include "Text.h"

namespace tools {
namespace {

std::wstring trimmed(const std::wstring& text)
{
    const auto first = text.find_first_not_of(L' ');
    return first == std::wstring::npos ? L"" : text.substr(first, text.find_last_not_of(L' ') - first + 1);
}

Arguments split(const std::wstring& text)
{
    Arguments parts;
    for (std::size_t at = 0; at < text.size();) {
        const std::size_t end = std::min(text.find(L'|', at), text.size());
        parts.push_back(trimmed(text.substr(at, end - at)));
        at = end + 1;
    }
    return parts;
}

} // namespace

Commands::Commands(std::vector<Command> table) : table_(std::move(table)) {}

Commands::Step Commands::runNext()
{
    const std::optional<std::wstring> line = readLine();
    if (!line)
        return Step::endOfInput;
    print(L"> " + *line);
    try {
        run(*line);
        print(L"done");
        return Step::done;
    } catch (const Failure& failure) {
        print(L"failed: " + failure.text);
    } catch (const std::exception& error) {
        print(L"failed: " + fromUtf8(error.what()));
    }
    return Step::failed;
}

void Commands::run(const std::wstring& line) const
{
    const std::size_t space = std::min(line.find(L' '), line.size());
    run(line.substr(0, space), split(line.substr(space)));
}

void Commands::run(const std::wstring& name, const Arguments& arguments) const
{
    const auto command =
        std::find_if(table_.begin(), table_.end(), [&](const Command& known) { return name == known.name; });
    if (command == table_.end())
        throw Failure{L"unknown command " + name};
    if (arguments.size() < command->minArguments || arguments.size() > command->maxArguments)
        throw Failure{L"usage: " + name + L" " + command->usage};
    command->run(arguments);
}

std::wstring Commands::join(const Arguments& arguments, std::size_t first)
{
    std::wstring line = arguments[first];
    for (std::size_t at = first + 1; at < arguments.size(); ++at)
        line += L" | " + arguments[at];
    return line;
}

std::optional<std::wstring> Commands::readLine()
{
    std::size_t end = 0;
    while ((end = unread_.find('\n')) == std::string::npos) {
        char part[4096];
        DWORD count = 0;
        if (!ReadFile(GetStdHandle(STD_INPUT_HANDLE), part, sizeof part, &count, nullptr) || count == 0)
            return std::nullopt;
        unread_.append(part, count);
    }
    const std::wstring line = fromUtf8(unread_.substr(0, end));
    unread_.erase(0, end + 1);
    return line;
}

} // namespace tools
