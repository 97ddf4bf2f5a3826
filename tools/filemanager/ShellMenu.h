#pragma once

#include <windows.h>
#include <shlobj.h>
#include <wrl/client.h>

#include <memory>
#include <string>
#include <vector>

#include "Output.h"

namespace filemanager {

using Microsoft::WRL::ComPtr;

struct IdListDeleter {
    void operator()(LPITEMIDLIST list) const noexcept
    {
        ILFree(list);
    }
};
using IdList = std::unique_ptr<std::remove_pointer_t<LPITEMIDLIST>, IdListDeleter>;

// An open folder; the path is empty for the list of drives.
struct Folder {
    IdList idList;
    ComPtr<IShellFolder> object;
    std::wstring path;
};

enum class MenuTarget { file, folder, drive, background };

enum OwnCommand : UINT {
    openCommand = 1,
    refreshCommand,
    selectAllCommand,
    propertiesCommand,
    firstHandlerCommand = 0x100
};

ComPtr<IDataObject> dataObject(HWND owner, const Folder& folder, std::vector<LPCITEMIDLIST> items);

// One context menu: a few items of our own and what the handlers registered for the target put into it. It lives as
// long as the menu is on screen; the handlers are released with it.
class ShellMenu {
  public:
    ShellMenu(HWND owner, const Folder& folder, MenuTarget target, const std::vector<LPCITEMIDLIST>& items,
              Output& output);
    ShellMenu(const ShellMenu&) = delete;
    ShellMenu& operator=(const ShellMenu&) = delete;
    ~ShellMenu();

    HMENU handle() const noexcept
    {
        return popup_;
    }
    // One line for each item: text, bitmap, verb, help text.
    std::vector<std::wstring> describe() const;
    // The command of the item with that text (accelerator marks left out), 0 if there is none.
    UINT findText(const std::wstring& text) const;
    std::wstring helpText(UINT command) const;
    // What the handlers took to make their part of the menu.
    long long handlerMicroseconds() const noexcept
    {
        return handlerMicroseconds_;
    }
    // Hands a command of a handler to it.
    HRESULT invoke(UINT command, HWND owner) const;

  private:
    struct Handler {
        ComPtr<IContextMenu> menu;
        UINT first;
        UINT count;
    };

    void addHandler(REFCLSID clsid, HKEY classKey, const Folder* background, IDataObject* data);
    void append(UINT command);
    void removeSpareSeparators();
    const Handler* handlerOf(UINT command) const;
    std::wstring commandString(UINT command, UINT type) const;

    HMENU popup_;
    Output& output_;
    std::vector<Handler> handlers_;
    UINT nextCommand_ = firstHandlerCommand;
    long long handlerMicroseconds_ = 0;
};

} // namespace filemanager
