#pragma once

#include <functional>
#include <string>
#include <vector>

#include <windows.h>
#include <commctrl.h>

#include "ShellMenu.h"

namespace filemanager {

// The window with the items of one folder. Members belong to the thread that created it; any thread may call handle().
class FolderWindow {
  public:
    // Sent by another thread: runs the std::function<void()> that LPARAM points to.
    static constexpr UINT kRunMessage = WM_APP + 1;
    // Posted by another thread: shows the property page in LPARAM, and owns it.
    static constexpr UINT kShowPageMessage = WM_APP + 2;

    FolderWindow();
    FolderWindow(const FolderWindow&) = delete;
    FolderWindow& operator=(const FolderWindow&) = delete;
    ~FolderWindow();

    HWND handle() const noexcept
    {
        return window_;
    }
    void open(const std::wstring& path);
    // Selects the items with these names and no other.
    void select(const std::vector<std::wstring>& names);
    // Creates the menu of the selection, or of the background if there is none.
    ShellMenu createMenu();
    // Performs the command with this text of that menu.
    void invoke(const std::wstring& text);
    // Creates the property page that a handler's class offers for the selection.
    HPROPSHEETPAGE createPage(const std::wstring& classId);
    // Stops the timer that has COM free unused servers.
    void stopFreeing();

  private:
    struct Item {
        IdList idList;
        std::wstring name;
        std::wstring path;
        WIN32_FILE_ATTRIBUTE_DATA data;
        bool isFolder;
    };

    static LRESULT CALLBACK procedure(HWND window, UINT message, WPARAM wParam, LPARAM lParam);
    LRESULT respond(UINT message, WPARAM wParam, LPARAM lParam);
    void createControls();
    void arrange();
    void readItems();
    void addRow(const Item& item, int row);
    void openItem(std::size_t index);
    int nextSelected(int after, LPARAM flags = 0) const;
    std::vector<std::size_t> selection() const;
    std::vector<LPCITEMIDLIST> selectedIdLists() const;
    void showMenu(POINT at);
    void perform(const ShellMenu& menu, UINT command);
    void showPage(HPROPSHEETPAGE page);
    void showItemCount();
    void showStatus(const std::wstring& text);

    HWND window_ = nullptr;
    HWND list_ = nullptr;
    HWND status_ = nullptr;
    Folder folder_;
    std::vector<Item> items_;
    const ShellMenu* shownMenu_ = nullptr;
};

} // namespace filemanager
