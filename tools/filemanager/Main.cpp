#include <windows.h>
#include <commctrl.h>
#include <ole2.h>

#include "common/Text.h"
#include "FolderWindow.h"
#include "Script.h"

namespace filemanager {
namespace {

struct OleScope {
    OleScope()
    {
        check(OleInitialize(nullptr), L"cannot start COM");
    }
    ~OleScope()
    {
        OleUninitialize();
    }
};

// explorer.exe FOLDER [--hidden]: shows a folder, with the menus of the context-menu handlers, and takes the commands
// of Script on its standard input.
int run(int count, wchar_t** words)
{
    const bool hidden = count == 3 && std::wstring(words[2]) == L"--hidden";
    if (count != 2 && !hidden)
        throw tools::Failure{L"usage: explorer.exe FOLDER [--hidden]"};
    const INITCOMMONCONTROLSEX controls = {sizeof controls,
                                           ICC_LISTVIEW_CLASSES | ICC_BAR_CLASSES | ICC_STANDARD_CLASSES};
    InitCommonControlsEx(&controls);
    const OleScope ole;
    FolderWindow window;
    window.open(words[1]);
    if (!hidden) {
        ShowWindow(window.handle(), SW_SHOWDEFAULT);
        UpdateWindow(window.handle());
    }
    Script script(window);
    MSG message;
    while (GetMessageW(&message, nullptr, 0, 0) > 0) {
        TranslateMessage(&message);
        DispatchMessageW(&message);
    }
    return script.finish();
}

} // namespace
} // namespace filemanager

int WINAPI wWinMain(HINSTANCE, HINSTANCE, PWSTR, int)
{
    try {
        return filemanager::run(__argc, __wargv);
    } catch (const tools::Failure& failure) {
        tools::printError(failure.text);
        return 1;
    }
}
