#include <windows.h>

#include <algorithm>
#include <cwchar>
#include <exception>
#include <optional>
#include <string>
#include <vector>

#include "Backup.h"
#include "Installation.h"
#include "Reports.h"
#include "Run.h"
#include "Text.h"

namespace service {
namespace {

using Arguments = std::vector<std::wstring>;

enum ExitCode { exitDone = 0, exitFailed = 1, exitIncomplete = 2 };

int runInstall(const Arguments& arguments)
{
    const Installation made = install(arguments[0]);
    print(L"installed in " + made.folder + L"\n");
    return exitDone;
}

int runBackup(const Arguments& arguments)
{
    std::vector<std::wstring> folders;
    std::optional<std::int64_t> time;
    for (std::size_t at = 0; at < arguments.size(); ++at) {
        if (arguments[at] != L"--at") {
            folders.push_back(arguments[at]);
            continue;
        }
        wchar_t* end = nullptr;
        const std::wstring value = at + 1 < arguments.size() ? arguments[++at] : L"";
        time = std::wcstoll(value.c_str(), &end, 10);
        if (value.empty() || *end || *time <= 0 || *time >= UINT32_MAX)
            throw Failure{L"--at takes a number of seconds since 1970"};
    }
    if (folders.empty())
        throw Failure{L"no folder given"};
    return backUp(findInstallation(), folders, time) ? exitDone : exitIncomplete;
}

int runRequests(const Arguments&)
{
    printRequests(findInstallation());
    return exitDone;
}

int runShow(const Arguments&)
{
    printManifest(findInstallation());
    return exitDone;
}

int runTell(const Arguments& arguments)
{
    return tell(arguments) ? exitDone : exitFailed;
}

struct Command {
    const wchar_t* name;
    const wchar_t* arguments;
    const wchar_t* help;
    std::size_t fewest;
    std::size_t most;
    int (*run)(const Arguments& arguments);
};

constexpr Command kCommands[] = {
    {L"install", L"STATEDIR", L"makes the service's folders, databases and registry keys", 1, 1, runInstall},
    {L"backup", L"FOLDER... [--at UNIXTIME]", L"one backup run; exit code 2 when some file could not be read", 1,
     SIZE_MAX, runBackup},
    {L"run", L"[--rate BYTES] [--search MS]", L"restores what is asked for, --rate bytes a second, and tells of it", 0,
     6, run},
    {L"tell", L"ORDER...", L"an order to the service at work", 1, 4, runTell},
    {L"requests", L"", L"prints the restore requests", 0, 0, runRequests},
    {L"show", L"", L"prints the manifest", 0, 0, runShow},
};

std::wstring usage()
{
    std::wstring text = L"taviservice COMMAND: a stand-in for the Tavi Remote Backup service\n";
    for (const Command& command : kCommands) {
        std::wstring line = std::wstring(L"  ") + command.name + L" " + command.arguments;
        line.resize(std::max<std::size_t>(40, line.size() + 2), L' ');
        text += line + command.help + L"\n";
    }
    return text + ordersHelp();
}

int runCommand(const Arguments& words)
{
    if (words.empty() || words[0] == L"--help") {
        print(usage());
        return words.empty() ? exitFailed : exitDone;
    }
    const Arguments arguments(words.begin() + 1, words.end());
    for (const Command& command : kCommands) {
        if (words[0] == command.name && arguments.size() >= command.fewest && arguments.size() <= command.most)
            return command.run(arguments);
    }
    printError(usage());
    return exitFailed;
}

} // namespace
} // namespace service

int wmain(int count, wchar_t** words)
{
    using namespace service;
    try {
        return runCommand(Arguments(words + 1, words + count));
    } catch (const Failure& failure) {
        printError(L"taviservice: " + failure.text + L"\n");
    } catch (const std::exception& error) {
        printError(L"taviservice: " + fromUtf8(error.what()) + L"\n");
    }
    return exitFailed;
}
