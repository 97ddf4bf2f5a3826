#pragma once

#include <windows.h>
#include <commctrl.h>

#include <cstdint>
#include <memory>
#include <string>
#include <vector>

#include "ShellMenu.h"

namespace filemanager {

enum ControlId : int { listControl = 1000, statusControl, addressControl, upControl };

// The window with the items of one folder. Its members are for the thread that made it, but run and handle, which any
// thread may use.
class FolderWindow {
  public:
    // Runs a std::function<void()> that LPARAM points to; WPARAM TRUE hands it over.
    static constexpr UINT kRunMessage = WM_APP + 1;

    explicit FolderWindow(Output& output) : output_(output) {}
    FolderWindow(const FolderWindow&) = delete;
    FolderWindow& operator=(const FolderWindow&) = delete;
    ~FolderWindow();

    void create();
    HWND handle() const noexcept
    {
        return window_;
    }
    // Keys that mean the same wherever the focus is.
    bool translate(MSG& message);

    // An empty path opens the list of drives.
    void navigate(const std::wstring& path);
    void up();
    void refresh();
    void openItem(const std::wstring& name);
    void select(const std::vector<std::wstring>& names);
    void selectAll(bool selected);
    // Prints the menu, too.
    std::unique_ptr<ShellMenu> makeMenu(bool background);
    void invoke(bool background, const std::wstring& text);
    // Makes the page that a handler's class has for the selection. No identifier leads to that table, which is the
    // first of the object.
    HPROPSHEETPAGE makePage(const std::wstring& classId);
    // Returns when the sheet is closed, which owns the page.
    void showPage(HPROPSHEETPAGE page);
    // Stops the timer that has COM free unused servers.
    void stopFreeing();

  private:
    struct Item {
        IdList idList;
        std::wstring name;
        std::wstring path;
        std::wstring type;
        std::uint64_t size = 0;
        FILETIME modified = {};
        bool isFolder = false;
        int icon = -1;
    };

    static LRESULT CALLBACK procedure(HWND window, UINT message, WPARAM wParam, LPARAM lParam);
    LRESULT respond(UINT message, WPARAM wParam, LPARAM lParam);
    void notify(NMHDR& header);
    void command(UINT id);
    void createControls();
    void arrange();
    int scaled(int pixels) const;
    void readItems();
    Item readItem(IdList child) const;
    void sort(int column);
    void describeCell(LVITEMW& cell);
    void activate(const Item& item);
    std::size_t indexOf(const std::wstring& name) const;
    int nextSelected(int after) const;
    int chosenItem() const;
    std::vector<LPCITEMIDLIST> selectedItems() const;
    void setSelected(int index, UINT state);
    void showMenu(POINT at);
    void perform(const ShellMenu& menu, UINT command);
    void showStatus();

    Output& output_;
    HWND window_ = nullptr;
    HWND list_ = nullptr;
    HWND status_ = nullptr;
    HWND address_ = nullptr;
    HWND up_ = nullptr;
    HFONT font_ = nullptr;
    HACCEL keys_ = nullptr;
    Folder folder_;
    std::vector<Item> items_;
    int sortColumn_ = 0;
    bool descending_ = false;
    const ShellMenu* shownMenu_ = nullptr;
};

} // namespace filemanager
