#include <windows.h>
#include <commctrl.h>
#include <ole2.h>
#include <shellapi.h>

#include <memory>
#include <optional>
#include <string>

#include "FolderWindow.h"
#include "Output.h"
#include "Script.h"

namespace filemanager {
namespace {

constexpr wchar_t kUsage[] =
    L"explorer.exe [FOLDER] [--script FILE] [--log FILE] [--hidden]\n"
    L"A file manager that hosts context-menu handlers. Without FOLDER it opens the list of drives.\n"
    L"  --script FILE  plays a script, see below; an error ends the program with exit code 1\n"
    L"  --log FILE     writes there what it prints: each menu it asks for, and the script's output\n"
    L"  --hidden       keeps the window off the screen\n"
    L"\n"
    L"A script is UTF-8 text with one command a line; # begins a comment; arguments are parted by |.\n"
    L"TITLE is the whole title of a window of this process, or . for the file manager's own, ID a control's number\n"
    L"(own: list 1000, status bar 1001, address 1002). Times are in milliseconds. A script that does not exit leaves "
    L"the\n"
    L"window open.\n";

struct Options {
    std::wstring folder;
    std::wstring script;
    std::wstring log;
    bool hidden = false;
    bool help = false;
};

Options parse(int count, wchar_t** words)
{
    Options options;
    for (int at = 1; at < count; ++at) {
        const std::wstring word = words[at];
        std::wstring* const value = word == L"--script" ? &options.script : word == L"--log" ? &options.log : nullptr;
        if (value && at + 1 < count)
            *value = words[++at];
        else if (word == L"--hidden")
            options.hidden = true;
        else if (word == L"--help")
            options.help = true;
        else if (word.compare(0, 2, L"--") != 0 && options.folder.empty())
            options.folder = word;
        else
            throw Failure{L"cannot use " + word + L"; --help lists the options"};
    }
    return options;
}

int runWindow(const Options& options, Output& output)
{
    FolderWindow window(output);
    window.create();
    try {
        window.navigate(options.folder);
    } catch (const Failure& failure) {
        if (!options.script.empty())
            throw;
        output.error(failure.text);
        window.navigate(L"");
    }
    std::optional<Script> script;
    if (!options.script.empty())
        script.emplace(window, output, readUtf8File(options.script));
    if (!options.hidden) {
        ShowWindow(window.handle(), SW_SHOWDEFAULT);
        UpdateWindow(window.handle());
    }
    if (script)
        script->start();
    MSG message;
    while (GetMessageW(&message, nullptr, 0, 0) > 0) {
        if (!window.translate(message)) {
            TranslateMessage(&message);
            DispatchMessageW(&message);
        }
    }
    return script ? script->finish() : 0;
}

struct OleScope {
    OleScope()
    {
        if (FAILED(OleInitialize(nullptr)))
            throw Failure{L"cannot start COM"};
    }
    ~OleScope()
    {
        OleUninitialize();
    }
};

} // namespace
} // namespace filemanager

int WINAPI wWinMain(HINSTANCE, HINSTANCE, PWSTR, int)
{
    using namespace filemanager;
    Output output;
    try {
        int count = 0;
        const std::unique_ptr<wchar_t*, decltype(&LocalFree)> words(CommandLineToArgvW(GetCommandLineW(), &count),
                                                                    LocalFree);
        const Options options = parse(count, words.get());
        if (options.help) {
            output.line(kUsage + (L"\n" + Script::commandsHelp()));
            return 0;
        }
        if (!options.log.empty())
            output.openLog(options.log);
        const INITCOMMONCONTROLSEX controls = {sizeof controls,
                                               ICC_LISTVIEW_CLASSES | ICC_BAR_CLASSES | ICC_STANDARD_CLASSES};
        InitCommonControlsEx(&controls);
        const OleScope ole;
        return runWindow(options, output);
    } catch (const Failure& failure) {
        output.error(failure.text);
        return 1;
    }
}
