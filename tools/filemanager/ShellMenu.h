#pragma once

#include <memory>
#include <string>
#include <vector>

#include <windows.h>
#include <shlobj.h>
#include <wrl/client.h>

namespace filemanager {

using Microsoft::WRL::ComPtr;

struct IdListDeleter {
    void operator()(LPITEMIDLIST list) const noexcept
    {
        ILFree(list);
    }
};
using IdList = std::unique_ptr<std::remove_pointer_t<LPITEMIDLIST>, IdListDeleter>;

struct Folder {
    IdList idList;
    ComPtr<IShellFolder> object;
    std::wstring path;
};

enum class MenuTarget { file, folder, background };

// The file manager's own items. Handlers get the numbers from kFirstHandlerCommand on.
constexpr UINT kOpenCommand = 1;
constexpr UINT kRefreshCommand = 2;
constexpr UINT kPropertiesCommand = 3;
constexpr UINT kFirstHandlerCommand = 0x100;

// Throws a Failure of `what` with the code, unless the result is a success.
void check(HRESULT result, const std::wstring& what);

ComPtr<IDataObject> dataObject(HWND owner, const Folder& folder, std::vector<LPCITEMIDLIST> items);

// One context menu: the file manager's own items and those of the handlers that are registered for the target. The
// handlers are released with the menu.
class ShellMenu {
  public:
    ShellMenu(HWND owner, const Folder& folder, MenuTarget target, const std::vector<LPCITEMIDLIST>& items);
    ShellMenu(const ShellMenu&) = delete;
    ShellMenu& operator=(const ShellMenu&) = delete;
    ~ShellMenu();

    HMENU handle() const noexcept
    {
        return popup_;
    }
    // Prints "menu:" and one line for each item: text, bitmap, verb, help text.
    void print() const;
    // Returns the command of the item with that text, without accelerator marks, or 0.
    UINT findText(const std::wstring& text) const;
    std::wstring helpText(UINT command) const;
    // The time that the handlers took to create their part of the menu.
    long long handlerMicroseconds() const noexcept
    {
        return handlerMicroseconds_;
    }
    // Has the handler of the command perform it.
    void invoke(UINT command, HWND owner) const;

  private:
    struct Handler {
        ComPtr<IContextMenu> menu;
        UINT first;
        UINT count;
    };

    void addHandlers(MenuTarget target, const Folder& folder, IDataObject* data);
    void addHandler(REFCLSID clsid, HKEY classKey, LPCITEMIDLIST folder, IDataObject* data);
    void removeDoubleSeparators();
    const Handler* handlerOf(UINT command) const;
    std::wstring commandString(UINT command, UINT type) const;

    HMENU popup_ = nullptr;
    std::vector<Handler> handlers_;
    UINT nextCommand_ = kFirstHandlerCommand;
    long long handlerMicroseconds_ = 0;
};

} // namespace filemanager
