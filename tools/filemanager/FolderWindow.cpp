#include "FolderWindow.h"

#include <algorithm>
#include <utility>

#include <shellapi.h>
#include <shlwapi.h>
#include <windowsx.h>

#include "common/Text.h"

namespace filemanager {
namespace {

using tools::Failure;

constexpr wchar_t kClassName[] = L"FileManagerWindow";
constexpr int kListId = 1000;
constexpr int kStatusId = 1001;
constexpr UINT_PTR kIdleTimer = 1;
constexpr UINT kIdleMs = 10000;

LRESULT send(HWND window, UINT message, WPARAM wParam = 0, LPARAM lParam = 0)
{
    return SendMessageW(window, message, wParam, lParam);
}

template <class Struct>
LRESULT send(HWND window, UINT message, WPARAM wParam, Struct* argument)
{
    return SendMessageW(window, message, wParam, reinterpret_cast<LPARAM>(argument));
}

std::wstring pathOf(IShellFolder* folder, LPCITEMIDLIST item)
{
    STRRET name = {};
    wchar_t text[MAX_PATH] = L"";
    if (SUCCEEDED(folder->GetDisplayNameOf(item, SHGDN_FORPARSING, &name)))
        StrRetToBufW(&name, item, text, MAX_PATH);
    return text;
}

std::wstring sizeText(const WIN32_FILE_ATTRIBUTE_DATA& data)
{
    wchar_t text[64] = L"";
    StrFormatKBSizeW(static_cast<LONGLONG>(data.nFileSizeHigh) << 32 | data.nFileSizeLow, text, 64);
    return text;
}

std::wstring dateText(const FILETIME& time)
{
    SYSTEMTIME utc;
    SYSTEMTIME local;
    wchar_t date[64] = L"";
    wchar_t clock[64] = L"";
    if (FileTimeToSystemTime(&time, &utc) && SystemTimeToTzSpecificLocalTime(nullptr, &utc, &local)) {
        GetDateFormatW(LOCALE_USER_DEFAULT, DATE_SHORTDATE, &local, nullptr, date, 64);
        GetTimeFormatW(LOCALE_USER_DEFAULT, TIME_NOSECONDS, &local, nullptr, clock, 64);
    }
    return std::wstring(date) + L" " + clock;
}

BOOL CALLBACK keepPage(HPROPSHEETPAGE page, LPARAM kept)
{
    *reinterpret_cast<HPROPSHEETPAGE*>(kept) = page;
    return TRUE;
}

} // namespace

FolderWindow::FolderWindow()
{
    WNDCLASSEXW windowClass = {};
    windowClass.cbSize = sizeof windowClass;
    windowClass.lpfnWndProc = procedure;
    windowClass.hInstance = GetModuleHandleW(nullptr);
    windowClass.hCursor = LoadCursorW(nullptr, IDC_ARROW);
    windowClass.lpszClassName = kClassName;
    RegisterClassExW(&windowClass);
    if (!CreateWindowExW(0, kClassName, L"File Manager", WS_OVERLAPPEDWINDOW | WS_CLIPCHILDREN, CW_USEDEFAULT,
                         CW_USEDEFAULT, 900, 600, nullptr, nullptr, windowClass.hInstance, this))
        throw tools::systemFailure(L"cannot create the window", GetLastError());
}

FolderWindow::~FolderWindow()
{
    if (window_)
        DestroyWindow(window_);
}

LRESULT CALLBACK FolderWindow::procedure(HWND window, UINT message, WPARAM wParam, LPARAM lParam)
{
    if (message == WM_NCCREATE) {
        const auto& creation = *reinterpret_cast<const CREATESTRUCTW*>(lParam);
        static_cast<FolderWindow*>(creation.lpCreateParams)->window_ = window;
        SetWindowLongPtrW(window, GWLP_USERDATA, reinterpret_cast<LONG_PTR>(creation.lpCreateParams));
    }
    const auto self = reinterpret_cast<FolderWindow*>(GetWindowLongPtrW(window, GWLP_USERDATA));
    if (!self)
        return DefWindowProcW(window, message, wParam, lParam);
    try {
        return self->respond(message, wParam, lParam);
    } catch (const Failure& failure) {
        tools::printError(failure.text);
        self->showStatus(failure.text);
    }
    return 0;
}

LRESULT FolderWindow::respond(UINT message, WPARAM wParam, LPARAM lParam)
{
    switch (message) {
    case WM_CREATE:
        createControls();
        SetTimer(window_, kIdleTimer, kIdleMs, nullptr);
        return 0;
    case WM_SIZE:
        arrange();
        return 0;
    case WM_SETFOCUS:
        SetFocus(list_);
        return 0;
    case WM_NOTIFY:
        if (reinterpret_cast<const NMHDR*>(lParam)->code == LVN_ITEMACTIVATE && nextSelected(-1) >= 0)
            openItem(selection().front());
        return 0;
    case WM_CONTEXTMENU:
        showMenu({GET_X_LPARAM(lParam), GET_Y_LPARAM(lParam)});
        return 0;
    case WM_MENUSELECT:
        showStatus(shownMenu_ ? shownMenu_->helpText(LOWORD(wParam)) : L"");
        return 0;
    case WM_TIMER:
        CoFreeUnusedLibraries();
        return 0;
    case kRunMessage:
        (*reinterpret_cast<const std::function<void()>*>(lParam))();
        return 0;
    case kShowPageMessage:
        showPage(reinterpret_cast<HPROPSHEETPAGE>(lParam));
        return 0;
    case WM_DESTROY:
        PostQuitMessage(0);
        return 0;
    case WM_NCDESTROY:
        return DefWindowProcW(std::exchange(window_, nullptr), message, wParam, lParam);
    default:
        return DefWindowProcW(window_, message, wParam, lParam);
    }
}

void FolderWindow::createControls()
{
    const auto child = [this](const wchar_t* className, DWORD style, DWORD extendedStyle, int id) {
        return CreateWindowExW(extendedStyle, className, L"", WS_CHILD | WS_VISIBLE | style, 0, 0, 0, 0, window_,
                               reinterpret_cast<HMENU>(static_cast<INT_PTR>(id)), GetModuleHandleW(nullptr), nullptr);
    };
    list_ = child(WC_LISTVIEWW, LVS_REPORT | LVS_SHOWSELALWAYS | LVS_SHAREIMAGELISTS | WS_TABSTOP, WS_EX_CLIENTEDGE,
                  kListId);
    status_ = child(STATUSCLASSNAMEW, SBARS_SIZEGRIP, 0, kStatusId);
    send(list_, LVM_SETEXTENDEDLISTVIEWSTYLE, 0, LVS_EX_FULLROWSELECT | LVS_EX_DOUBLEBUFFER | LVS_EX_LABELTIP);
    SHFILEINFOW info = {};
    const DWORD_PTR images = SHGetFileInfoW(L"C:\\", 0, &info, sizeof info, SHGFI_SYSICONINDEX | SHGFI_SMALLICON);
    send(list_, LVM_SETIMAGELIST, LVSIL_SMALL, static_cast<LPARAM>(images));

    WPARAM position = 0;
    const auto addColumn = [&](std::wstring title, int width, int format) {
        LVCOLUMNW column = {};
        column.mask = LVCF_TEXT | LVCF_WIDTH | LVCF_FMT;
        column.pszText = title.data();
        column.cx = width;
        column.fmt = format;
        send(list_, LVM_INSERTCOLUMNW, position++, &column);
    };
    addColumn(L"Name", 560, LVCFMT_LEFT);
    addColumn(L"Size", 120, LVCFMT_RIGHT);
    addColumn(L"Modified", 190, LVCFMT_LEFT);
}

void FolderWindow::arrange()
{
    RECT client;
    RECT bar;
    GetClientRect(window_, &client);
    send(status_, WM_SIZE);
    GetWindowRect(status_, &bar);
    MoveWindow(list_, 0, 0, client.right, std::max(0L, client.bottom - (bar.bottom - bar.top)), TRUE);
}

void FolderWindow::open(const std::wstring& path)
{
    Folder opened;
    opened.path = path;
    ComPtr<IShellFolder> desktop;
    check(SHGetDesktopFolder(&desktop), L"no desktop folder");
    LPITEMIDLIST idList = nullptr;
    check(desktop->ParseDisplayName(window_, nullptr, opened.path.data(), nullptr, &idList, nullptr),
          L"no such folder: " + path);
    opened.idList.reset(idList);
    check(desktop->BindToObject(idList, nullptr, IID_IShellFolder,
                                reinterpret_cast<void**>(opened.object.GetAddressOf())),
          L"cannot open " + path);
    folder_ = std::move(opened);
    SetWindowTextW(window_, (path + L" - File Manager").c_str());
    readItems();
}

void FolderWindow::readItems()
{
    send(list_, LVM_DELETEALLITEMS);
    items_.clear();
    ComPtr<IEnumIDList> children;
    check(folder_.object->EnumObjects(window_, SHCONTF_FOLDERS | SHCONTF_NONFOLDERS | SHCONTF_INCLUDEHIDDEN, &children),
          L"cannot list the folder");
    LPITEMIDLIST child = nullptr;
    while (children && children->Next(1, &child, nullptr) == S_OK) {
        Item item = {IdList(child), L"", pathOf(folder_.object.Get(), child), {}, false};
        item.name = PathFindFileNameW(item.path.c_str());
        GetFileAttributesExW(item.path.c_str(), GetFileExInfoStandard, &item.data);
        item.isFolder = (item.data.dwFileAttributes & FILE_ATTRIBUTE_DIRECTORY) != 0;
        items_.push_back(std::move(item));
    }
    std::sort(items_.begin(), items_.end(), [](const Item& a, const Item& b) {
        return a.isFolder != b.isFolder ? a.isFolder : StrCmpLogicalW(a.name.c_str(), b.name.c_str()) < 0;
    });
    int row = 0;
    for (const Item& item : items_)
        addRow(item, row++);
    showItemCount();
}

void FolderWindow::addRow(const Item& item, int row)
{
    const auto setCell = [&](UINT message, int column, std::wstring text) {
        LVITEMW cell = {};
        cell.mask = column == 0 ? LVIF_TEXT | LVIF_IMAGE : LVIF_TEXT;
        cell.iItem = row;
        cell.iSubItem = column;
        cell.pszText = text.data();
        cell.iImage =
            column == 0 ? SHMapPIDLToSystemImageListIndex(folder_.object.Get(), item.idList.get(), nullptr) : 0;
        send(list_, message, 0, &cell);
    };
    setCell(LVM_INSERTITEMW, 0, item.name);
    setCell(LVM_SETITEMW, 1, item.isFolder ? L"" : sizeText(item.data));
    setCell(LVM_SETITEMW, 2, dateText(item.data.ftLastWriteTime));
}

void FolderWindow::openItem(std::size_t index)
{
    const Item& item = items_[index];
    if (item.isFolder)
        open(std::wstring(item.path));
    else
        ShellExecuteW(window_, nullptr, item.path.c_str(), nullptr, folder_.path.c_str(), SW_SHOWNORMAL);
}

void FolderWindow::select(const std::vector<std::wstring>& names)
{
    const auto setState = [this](int row, UINT state) {
        LVITEMW item = {};
        item.stateMask = LVIS_SELECTED | LVIS_FOCUSED;
        item.state = state;
        send(list_, LVM_SETITEMSTATE, static_cast<WPARAM>(row), &item);
    };
    setState(-1, 0);
    for (const std::wstring& name : names) {
        const auto found =
            std::find_if(items_.begin(), items_.end(), [&](const Item& item) { return item.name == name; });
        if (found == items_.end())
            throw Failure{L"no item is named " + name};
        setState(static_cast<int>(found - items_.begin()), LVIS_SELECTED | (name == names[0] ? LVIS_FOCUSED : 0));
    }
}

int FolderWindow::nextSelected(int after, LPARAM flags) const
{
    return static_cast<int>(send(list_, LVM_GETNEXTITEM, static_cast<WPARAM>(after), LVNI_SELECTED | flags));
}

// As in the shell, the item with the focus comes first: it decides which handlers are asked about a mixed selection.
std::vector<std::size_t> FolderWindow::selection() const
{
    std::vector<std::size_t> indexes;
    const int focused = nextSelected(-1, LVNI_FOCUSED);
    if (focused >= 0)
        indexes.push_back(static_cast<std::size_t>(focused));
    for (int index = nextSelected(-1); index >= 0; index = nextSelected(index)) {
        if (index != focused)
            indexes.push_back(static_cast<std::size_t>(index));
    }
    return indexes;
}

std::vector<LPCITEMIDLIST> FolderWindow::selectedIdLists() const
{
    std::vector<LPCITEMIDLIST> idLists;
    for (const std::size_t index : selection())
        idLists.push_back(items_[index].idList.get());
    return idLists;
}

ShellMenu FolderWindow::createMenu()
{
    const std::vector<std::size_t> selected = selection();
    const MenuTarget target = selected.empty()                    ? MenuTarget::background
                              : items_[selected.front()].isFolder ? MenuTarget::folder
                                                                  : MenuTarget::file;
    return ShellMenu(window_, folder_, target, selectedIdLists());
}

void FolderWindow::showMenu(POINT at)
{
    const ShellMenu menu = createMenu();
    menu.print();
    SetForegroundWindow(window_);
    shownMenu_ = &menu;
    const auto chosen = TrackPopupMenuEx(menu.handle(), TPM_RETURNCMD | TPM_RIGHTBUTTON, at.x, at.y, window_, nullptr);
    shownMenu_ = nullptr;
    showItemCount();
    if (chosen)
        perform(menu, static_cast<UINT>(chosen));
}

void FolderWindow::invoke(const std::wstring& text)
{
    const ShellMenu menu = createMenu();
    const UINT command = menu.findText(text);
    if (command == 0)
        throw Failure{L"the menu has no item " + text};
    perform(menu, command);
}

void FolderWindow::perform(const ShellMenu& menu, UINT command)
{
    if (command == kOpenCommand)
        openItem(selection().front());
    else if (command == kRefreshCommand)
        readItems();
    else
        menu.invoke(command, window_);
}

// No interface identifier leads to the table of the property sheet extension, which is the first of the object.
HPROPSHEETPAGE FolderWindow::createPage(const std::wstring& classId)
{
    CLSID id = {};
    check(CLSIDFromString(classId.c_str(), &id), L"no class " + classId);
    ComPtr<IShellExtInit> handler;
    check(CoCreateInstance(id, nullptr, CLSCTX_INPROC_SERVER, IID_IShellExtInit,
                           reinterpret_cast<void**>(handler.GetAddressOf())),
          L"no object of " + classId);
    check(handler->Initialize(nullptr, dataObject(window_, folder_, selectedIdLists()).Get(), nullptr),
          L"the handler refuses the selection");
    ComPtr<IUnknown> primary;
    check(handler.CopyTo(IID_IUnknown, reinterpret_cast<void**>(primary.GetAddressOf())), L"no primary table");
    HPROPSHEETPAGE page = nullptr;
    reinterpret_cast<IShellPropSheetExt*>(primary.Get())->AddPages(keepPage, reinterpret_cast<LPARAM>(&page));
    if (!page)
        throw Failure{L"no page for this selection"};
    return page;
}

void FolderWindow::showPage(HPROPSHEETPAGE page)
{
    PROPSHEETHEADERW sheet = {};
    sheet.dwSize = sizeof sheet;
    sheet.dwFlags = PSH_NOAPPLYNOW;
    sheet.hwndParent = window_;
    sheet.pszCaption = L"Properties";
    sheet.nPages = 1;
    sheet.phpage = &page;
    PropertySheetW(&sheet);
}

void FolderWindow::stopFreeing()
{
    KillTimer(window_, kIdleTimer);
}

void FolderWindow::showItemCount()
{
    showStatus(std::to_wstring(items_.size()) + L" items");
}

void FolderWindow::showStatus(const std::wstring& text)
{
    SetWindowTextW(status_, text.c_str());
}

} // namespace filemanager
