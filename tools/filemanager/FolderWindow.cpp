#include "FolderWindow.h"

#include <shellapi.h>
#include <shlwapi.h>
#include <uxtheme.h>
#include <windowsx.h>

#include <algorithm>
#include <functional>
#include <map>
#include <utility>

namespace filemanager {
namespace {

constexpr wchar_t kClassName[] = L"FileManagerWindow";
constexpr wchar_t kDrives[] = L"Computer";
constexpr UINT_PTR kIdleTimer = 1;
constexpr UINT kIdleMilliseconds = 10000;

enum Column { nameColumn, sizeColumn, typeColumn, modifiedColumn };
struct ColumnStyle {
    const wchar_t* title;
    int width;
    int format;
};
constexpr ColumnStyle kColumns[] = {
    {L"Name", 390, LVCFMT_LEFT},
    {L"Size", 100, LVCFMT_RIGHT},
    {L"Type", 190, LVCFMT_LEFT},
    {L"Modified", 170, LVCFMT_LEFT},
};

LRESULT send(HWND window, UINT message, WPARAM wParam = 0, LPARAM lParam = 0)
{
    return SendMessageW(window, message, wParam, lParam);
}

template <class Struct>
LRESULT send(HWND window, UINT message, WPARAM wParam, Struct* argument)
{
    return SendMessageW(window, message, wParam, reinterpret_cast<LPARAM>(argument));
}

void check(HRESULT result, const std::wstring& what)
{
    if (FAILED(result))
        throw Failure{what + L": " + hexCode(result)};
}

std::wstring displayName(IShellFolder* folder, LPCITEMIDLIST item, DWORD flags)
{
    STRRET name = {};
    wchar_t text[MAX_PATH] = L"";
    if (SUCCEEDED(folder->GetDisplayNameOf(item, flags, &name)))
        StrRetToBufW(&name, item, text, MAX_PATH);
    return text;
}

std::wstring typeName(const std::wstring& path, bool isFolder)
{
    // One look into the registry for each kind of file.
    static std::map<std::wstring, std::wstring> known;
    const bool isRoot = PathIsRootW(path.c_str()) != FALSE;
    const std::wstring key = isRoot ? path : isFolder ? L"\\" : PathFindExtensionW(path.c_str());
    const auto [entry, added] = known.try_emplace(key);
    if (added) {
        SHFILEINFOW info = {};
        SHGetFileInfoW(path.c_str(), isFolder ? FILE_ATTRIBUTE_DIRECTORY : FILE_ATTRIBUTE_NORMAL, &info, sizeof info,
                       SHGFI_TYPENAME | (isRoot ? 0u : UINT{SHGFI_USEFILEATTRIBUTES}));
        entry->second = info.szTypeName;
    }
    return entry->second;
}

std::wstring dateText(const FILETIME& time)
{
    SYSTEMTIME utc;
    SYSTEMTIME local;
    wchar_t date[64] = L"";
    wchar_t clock[64] = L"";
    if (time.dwHighDateTime == 0 || !FileTimeToSystemTime(&time, &utc) ||
        !SystemTimeToTzSpecificLocalTime(nullptr, &utc, &local))
        return L"";
    GetDateFormatW(LOCALE_USER_DEFAULT, DATE_SHORTDATE, &local, nullptr, date, 64);
    GetTimeFormatW(LOCALE_USER_DEFAULT, TIME_NOSECONDS, &local, nullptr, clock, 64);
    return std::wstring(date) + L" " + clock;
}

void runAction(std::function<void()>* action, bool owned)
{
    const std::unique_ptr<std::function<void()>> handedOver(owned ? action : nullptr);
    (*action)();
}

BOOL CALLBACK keepPage(HPROPSHEETPAGE page, LPARAM kept)
{
    *reinterpret_cast<HPROPSHEETPAGE*>(kept) = page;
    return TRUE;
}

} // namespace

FolderWindow::~FolderWindow()
{
    if (window_)
        DestroyWindow(window_);
    DestroyAcceleratorTable(keys_);
    DeleteObject(font_);
}

void FolderWindow::create()
{
    WNDCLASSEXW windowClass = {};
    windowClass.cbSize = sizeof windowClass;
    windowClass.lpfnWndProc = procedure;
    windowClass.hInstance = GetModuleHandleW(nullptr);
    windowClass.hCursor = LoadCursorW(nullptr, IDC_ARROW);
    windowClass.hbrBackground = GetSysColorBrush(COLOR_BTNFACE);
    windowClass.lpszClassName = kClassName;
    RegisterClassExW(&windowClass);
    if (!CreateWindowExW(0, kClassName, L"File Manager", WS_OVERLAPPEDWINDOW | WS_CLIPCHILDREN, CW_USEDEFAULT,
                         CW_USEDEFAULT, 900, 600, nullptr, nullptr, windowClass.hInstance, this))
        throw Failure{L"cannot make the window"};
    ACCEL keys[] = {{FVIRTKEY, VK_F5, refreshCommand},
                    {FVIRTKEY | FALT, VK_UP, upControl},
                    {FVIRTKEY | FCONTROL, 'L', addressControl}};
    keys_ = CreateAcceleratorTableW(keys, static_cast<int>(std::size(keys)));
}

bool FolderWindow::translate(MSG& message)
{
    return TranslateAcceleratorW(window_, keys_, &message) || IsDialogMessageW(window_, &message);
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
        self->output_.error(failure.text);
        SetWindowTextW(self->status_, failure.text.c_str());
    }
    return 0;
}

LRESULT FolderWindow::respond(UINT message, WPARAM wParam, LPARAM lParam)
{
    switch (message) {
    case WM_CREATE:
        createControls();
        SetTimer(window_, kIdleTimer, kIdleMilliseconds, nullptr);
        return 0;
    case WM_SIZE:
        arrange();
        return 0;
    case WM_SETFOCUS:
        SetFocus(list_);
        return 0;
    case WM_NOTIFY:
        notify(*reinterpret_cast<NMHDR*>(lParam));
        return 0;
    case WM_COMMAND:
        if (HIWORD(wParam) <= 1)
            command(LOWORD(wParam));
        return 0;
    case WM_CONTEXTMENU:
        if (reinterpret_cast<HWND>(wParam) == list_) {
            const int item = chosenItem();
            POINT at = {GET_X_LPARAM(lParam), GET_Y_LPARAM(lParam)};
            if (at.x == -1 && at.y == -1) { // asked for with the keyboard
                RECT box = {LVIR_LABEL, 0, 0, scaled(40)};
                if (item >= 0)
                    send(list_, LVM_GETITEMRECT, static_cast<WPARAM>(item), &box);
                at = {box.left + scaled(20), box.bottom};
                ClientToScreen(list_, &at);
            }
            showMenu(at);
        }
        return 0;
    case WM_MENUSELECT:
        if (shownMenu_ && lParam != 0 && !(HIWORD(wParam) & (MF_POPUP | MF_SEPARATOR)))
            SetWindowTextW(status_, shownMenu_->helpText(LOWORD(wParam)).c_str());
        else
            showStatus();
        return 0;
    case WM_SYSCOMMAND:
        // The Alt key alone would open the window menu after Alt+Up.
        return (wParam & 0xFFF0) == SC_KEYMENU && lParam == 0 ? 0 : DefWindowProcW(window_, message, wParam, lParam);
    case WM_TIMER:
        CoFreeUnusedLibraries();
        return 0;
    case kRunMessage:
        runAction(reinterpret_cast<std::function<void()>*>(lParam), wParam == TRUE);
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

void FolderWindow::notify(NMHDR& header)
{
    if (header.hwndFrom != list_)
        return;
    switch (header.code) {
    case LVN_GETDISPINFOW:
        describeCell(reinterpret_cast<NMLVDISPINFOW&>(header).item);
        break;
    case LVN_ITEMACTIVATE:
        if (const int index = reinterpret_cast<const NMITEMACTIVATE&>(header).iItem; index >= 0)
            activate(items_[static_cast<std::size_t>(index)]);
        break;
    case LVN_COLUMNCLICK:
        sort(reinterpret_cast<const NMLISTVIEW&>(header).iSubItem);
        break;
    case LVN_KEYDOWN:
        if (const WORD key = reinterpret_cast<const NMLVKEYDOWN&>(header).wVKey; key == VK_BACK)
            up();
        else if (key == 'A' && GetKeyState(VK_CONTROL) < 0)
            selectAll(true);
        break;
    case LVN_ITEMCHANGED:
    case LVN_ODSTATECHANGED:
        showStatus();
        break;
    }
}

void FolderWindow::command(UINT id)
{
    switch (id) {
    case refreshCommand:
        refresh();
        break;
    case upControl:
        up();
        break;
    case addressControl:
        SetFocus(address_);
        send(address_, EM_SETSEL, 0, -1);
        break;
    case IDOK: // Enter
        if (GetFocus() == address_) {
            wchar_t text[MAX_PATH];
            GetWindowTextW(address_, text, MAX_PATH);
            navigate(lstrcmpiW(text, kDrives) == 0 ? L"" : text);
        } else if (GetFocus() == up_) {
            up();
        } else if (const auto index =
                       send(list_, LVM_GETNEXTITEM, static_cast<WPARAM>(-1), LVNI_FOCUSED | LVNI_SELECTED);
                   index >= 0) {
            activate(items_[static_cast<std::size_t>(index)]);
        }
        break;
    }
}

void FolderWindow::createControls()
{
    const auto child = [this](const wchar_t* className, const wchar_t* text, DWORD style, DWORD extended, int id) {
        const HWND control =
            CreateWindowExW(extended, className, text, WS_CHILD | WS_VISIBLE | style, 0, 0, 0, 0, window_,
                            reinterpret_cast<HMENU>(static_cast<INT_PTR>(id)), GetModuleHandleW(nullptr), nullptr);
        send(control, WM_SETFONT, reinterpret_cast<WPARAM>(font_));
        return control;
    };
    NONCLIENTMETRICSW metrics = {};
    metrics.cbSize = sizeof metrics;
    if (SystemParametersInfoW(SPI_GETNONCLIENTMETRICS, sizeof metrics, &metrics, 0))
        font_ = CreateFontIndirectW(&metrics.lfMessageFont);

    up_ = child(L"BUTTON", L"&Up", BS_PUSHBUTTON | WS_TABSTOP, 0, upControl);
    address_ = child(L"EDIT", L"", ES_AUTOHSCROLL | WS_TABSTOP, WS_EX_CLIENTEDGE, addressControl);
    list_ = child(WC_LISTVIEWW, L"", LVS_REPORT | LVS_OWNERDATA | LVS_SHOWSELALWAYS | LVS_SHAREIMAGELISTS | WS_TABSTOP,
                  WS_EX_CLIENTEDGE, listControl);
    status_ = child(STATUSCLASSNAMEW, L"", SBARS_SIZEGRIP, 0, statusControl);
    SHAutoComplete(address_, SHACF_FILESYSTEM);
    SetWindowTheme(list_, L"Explorer", nullptr);
    send(list_, LVM_SETEXTENDEDLISTVIEWSTYLE, 0, LVS_EX_FULLROWSELECT | LVS_EX_DOUBLEBUFFER | LVS_EX_LABELTIP);
    SHFILEINFOW info = {};
    const DWORD_PTR images = SHGetFileInfoW(L"C:\\", 0, &info, sizeof info, SHGFI_SYSICONINDEX | SHGFI_SMALLICON);
    send(list_, LVM_SETIMAGELIST, LVSIL_SMALL, static_cast<LPARAM>(images));
    int at = 0;
    for (const ColumnStyle& style : kColumns) {
        wchar_t title[16];
        LVCOLUMNW column = {};
        column.mask = LVCF_TEXT | LVCF_WIDTH | LVCF_FMT;
        column.pszText = lstrcpynW(title, style.title, 16);
        column.cx = scaled(style.width);
        column.fmt = style.format;
        send(list_, LVM_INSERTCOLUMNW, static_cast<WPARAM>(at++), &column);
    }
}

void FolderWindow::arrange()
{
    RECT client;
    RECT bar;
    GetClientRect(window_, &client);
    send(status_, WM_SIZE);
    GetWindowRect(status_, &bar);
    const int gap = scaled(6);
    const int button = scaled(48);
    const int top = gap + scaled(23) + gap;
    const int bottom = client.bottom - (bar.bottom - bar.top);
    MoveWindow(up_, gap, gap, button, scaled(23), TRUE);
    MoveWindow(address_, gap + button + gap, gap + scaled(1),
               std::max(0, static_cast<int>(client.right) - button - 3 * gap), scaled(21), TRUE);
    MoveWindow(list_, 0, top, client.right, std::max(0, bottom - top), TRUE);
}

int FolderWindow::scaled(int pixels) const
{
    const HDC dc = GetDC(window_);
    const int dpi = GetDeviceCaps(dc, LOGPIXELSX);
    ReleaseDC(window_, dc);
    return MulDiv(pixels, dpi, 96);
}

void FolderWindow::navigate(const std::wstring& path)
{
    Folder opened;
    ComPtr<IShellFolder> desktop;
    check(SHGetDesktopFolder(&desktop), L"no desktop folder");
    LPITEMIDLIST idList = nullptr;
    if (path.empty()) {
        check(SHGetFolderLocation(window_, CSIDL_DRIVES, nullptr, 0, &idList), L"no list of drives");
    } else {
        wchar_t full[MAX_PATH] = L"";
        const DWORD length = GetFullPathNameW(path.c_str(), MAX_PATH, full, nullptr);
        if (length == 0 || length >= MAX_PATH || !PathIsDirectoryW(full))
            throw Failure{L"no such folder: " + path};
        if (!PathIsRootW(full))
            PathRemoveBackslashW(full);
        opened.path = full;
        check(desktop->ParseDisplayName(window_, nullptr, full, nullptr, &idList, nullptr), L"cannot open " + path);
    }
    opened.idList.reset(idList);
    check(desktop->BindToObject(idList, nullptr, IID_IShellFolder,
                                reinterpret_cast<void**>(opened.object.GetAddressOf())),
          L"cannot open " + path);

    folder_ = std::move(opened);
    const std::wstring title = folder_.path.empty() ? kDrives : folder_.path;
    SetWindowTextW(window_, (title + L" - File Manager").c_str());
    SetWindowTextW(address_, title.c_str());
    for (const auto& [size, kind] :
         {std::pair<UINT, WPARAM>{SHGFI_SMALLICON, ICON_SMALL}, {SHGFI_LARGEICON, ICON_BIG}}) {
        SHFILEINFOW info = {};
        SHGetFileInfoW(reinterpret_cast<LPCWSTR>(idList), 0, &info, sizeof info, SHGFI_PIDL | SHGFI_ICON | size);
        if (const LRESULT former = send(window_, WM_SETICON, kind, reinterpret_cast<LPARAM>(info.hIcon)))
            DestroyIcon(reinterpret_cast<HICON>(former));
    }
    readItems();
}

void FolderWindow::up()
{
    if (folder_.path.empty())
        return;
    const std::wstring from = folder_.path;
    wchar_t parent[MAX_PATH];
    lstrcpynW(parent, from.c_str(), MAX_PATH);
    navigate(PathRemoveFileSpecW(parent) && !PathIsRootW(from.c_str()) ? parent : L"");
    select({PathIsRootW(from.c_str()) ? from : PathFindFileNameW(from.c_str())});
}

void FolderWindow::refresh()
{
    navigate(folder_.path);
}

void FolderWindow::readItems()
{
    send(list_, LVM_SETITEMCOUNT, 0);
    items_.clear();
    ComPtr<IEnumIDList> children;
    const SHCONTF flags = SHCONTF_FOLDERS | SHCONTF_NONFOLDERS | SHCONTF_INCLUDEHIDDEN;
    check(folder_.object->EnumObjects(window_, flags, &children), L"cannot list the folder");
    LPITEMIDLIST child = nullptr;
    while (children && children->Next(1, &child, nullptr) == S_OK) {
        Item item = readItem(IdList(child));
        // The list of drives also holds things that are no drives.
        if (!item.path.empty() && (!folder_.path.empty() || PathIsRootW(item.path.c_str())))
            items_.push_back(std::move(item));
    }
    sort(-1);
}

FolderWindow::Item FolderWindow::readItem(IdList child) const
{
    Item item;
    item.path = displayName(folder_.object.Get(), child.get(), SHGDN_FORPARSING);
    item.name = folder_.path.empty() ? displayName(folder_.object.Get(), child.get(), SHGDN_INFOLDER)
                                     : std::wstring(PathFindFileNameW(item.path.c_str()));
    if (item.name.compare(0, 1, L" ") == 0) // a drive without a label
        item.name.insert(0, L"Disk");
    item.idList = std::move(child);
    WIN32_FILE_ATTRIBUTE_DATA data = {};
    if (folder_.path.empty()) {
        item.isFolder = true;
    } else if (GetFileAttributesExW(item.path.c_str(), GetFileExInfoStandard, &data)) {
        item.isFolder = (data.dwFileAttributes & FILE_ATTRIBUTE_DIRECTORY) != 0;
        item.size = std::uint64_t{data.nFileSizeHigh} << 32 | data.nFileSizeLow;
        item.modified = data.ftLastWriteTime;
    }
    item.type = typeName(item.path, item.isFolder);
    return item;
}

// A column sorts by itself, its second click the other way round; -1 keeps the order. Folders stay on top.
void FolderWindow::sort(int column)
{
    descending_ = column >= 0 && column == sortColumn_ && !descending_;
    sortColumn_ = column >= 0 ? column : sortColumn_;
    const auto compare = [this](const Item& a, const Item& b) {
        switch (sortColumn_) {
        case sizeColumn:
            return a.size < b.size ? -1 : int{a.size > b.size};
        case typeColumn:
            return StrCmpLogicalW(a.type.c_str(), b.type.c_str());
        case modifiedColumn:
            return static_cast<int>(CompareFileTime(&a.modified, &b.modified));
        default:
            return StrCmpLogicalW(a.name.c_str(), b.name.c_str());
        }
    };
    std::stable_sort(items_.begin(), items_.end(), [&](const Item& a, const Item& b) {
        return a.isFolder != b.isFolder ? a.isFolder : descending_ ? compare(b, a) < 0 : compare(a, b) < 0;
    });
    const auto header = reinterpret_cast<HWND>(send(list_, LVM_GETHEADER));
    for (int at = 0; at < static_cast<int>(std::size(kColumns)); ++at) {
        HDITEMW item = {};
        item.mask = HDI_FORMAT;
        send(header, HDM_GETITEMW, static_cast<WPARAM>(at), &item);
        item.fmt = (item.fmt & ~(HDF_SORTUP | HDF_SORTDOWN)) | (at != sortColumn_ ? 0
                                                                : descending_     ? HDF_SORTDOWN
                                                                                  : HDF_SORTUP);
        send(header, HDM_SETITEMW, static_cast<WPARAM>(at), &item);
    }
    selectAll(false);
    send(list_, LVM_SETITEMCOUNT, items_.size());
    InvalidateRect(list_, nullptr, TRUE);
    showStatus();
}

void FolderWindow::describeCell(LVITEMW& cell)
{
    Item& item = items_[static_cast<std::size_t>(cell.iItem)];
    if (cell.mask & LVIF_IMAGE) {
        if (item.icon < 0)
            item.icon = std::max(0, SHMapPIDLToSystemImageListIndex(folder_.object.Get(), item.idList.get(), nullptr));
        cell.iImage = item.icon;
    }
    if (!(cell.mask & LVIF_TEXT) || cell.cchTextMax <= 0)
        return;
    switch (cell.iSubItem) {
    case nameColumn:
        lstrcpynW(cell.pszText, item.name.c_str(), cell.cchTextMax);
        break;
    case sizeColumn:
        cell.pszText[0] = L'\0';
        if (!item.isFolder)
            StrFormatKBSizeW(static_cast<LONGLONG>(item.size), cell.pszText, static_cast<UINT>(cell.cchTextMax));
        break;
    case typeColumn:
        lstrcpynW(cell.pszText, item.type.c_str(), cell.cchTextMax);
        break;
    case modifiedColumn:
        lstrcpynW(cell.pszText, dateText(item.modified).c_str(), cell.cchTextMax);
        break;
    }
}

void FolderWindow::activate(const Item& item)
{
    const std::wstring path = item.path;
    if (item.isFolder)
        navigate(path);
    else if (reinterpret_cast<INT_PTR>(
                 ShellExecuteW(window_, nullptr, path.c_str(), nullptr, folder_.path.c_str(), SW_SHOWNORMAL)) <= 32)
        throw Failure{L"no program opens " + item.name};
}

void FolderWindow::openItem(const std::wstring& name)
{
    const Item& item = items_[indexOf(name)];
    if (!item.isFolder)
        throw Failure{name + L" is not a folder"};
    activate(item);
}

std::size_t FolderWindow::indexOf(const std::wstring& name) const
{
    const auto found = std::find_if(items_.begin(), items_.end(), [&](const Item& item) {
        return lstrcmpiW(item.name.c_str(), name.c_str()) == 0 || lstrcmpiW(item.path.c_str(), name.c_str()) == 0;
    });
    if (found == items_.end())
        throw Failure{L"no item is named " + name};
    return static_cast<std::size_t>(found - items_.begin());
}

void FolderWindow::select(const std::vector<std::wstring>& names)
{
    std::vector<int> indexes;
    indexes.reserve(names.size());
    for (const std::wstring& name : names)
        indexes.push_back(static_cast<int>(indexOf(name)));
    selectAll(false);
    for (const int index : indexes)
        setSelected(index, index == indexes.front() ? LVIS_SELECTED | LVIS_FOCUSED : LVIS_SELECTED);
    send(list_, LVM_ENSUREVISIBLE, static_cast<WPARAM>(indexes.front()));
}

void FolderWindow::selectAll(bool selected)
{
    setSelected(-1, selected ? LVIS_SELECTED : 0);
}

void FolderWindow::setSelected(int index, UINT state)
{
    LVITEMW item = {};
    item.stateMask = LVIS_SELECTED | (state & LVIS_FOCUSED);
    item.state = state;
    send(list_, LVM_SETITEMSTATE, static_cast<WPARAM>(index), &item);
}

int FolderWindow::nextSelected(int after) const
{
    return static_cast<int>(send(list_, LVM_GETNEXTITEM, static_cast<WPARAM>(after), LVNI_SELECTED));
}

// As in the shell, the item with the focus, or else the first, chooses the handlers of a mixed selection.
int FolderWindow::chosenItem() const
{
    const auto focused =
        static_cast<int>(send(list_, LVM_GETNEXTITEM, static_cast<WPARAM>(-1), LVNI_FOCUSED | LVNI_SELECTED));
    return focused >= 0 ? focused : nextSelected(-1);
}

// The item that chooses the handlers comes first.
std::vector<LPCITEMIDLIST> FolderWindow::selectedItems() const
{
    std::vector<LPCITEMIDLIST> selected;
    const int chooser = chosenItem();
    if (chooser >= 0)
        selected.push_back(items_[static_cast<std::size_t>(chooser)].idList.get());
    for (int index = nextSelected(-1); index >= 0; index = nextSelected(index)) {
        if (index != chooser)
            selected.push_back(items_[static_cast<std::size_t>(index)].idList.get());
    }
    return selected;
}

std::unique_ptr<ShellMenu> FolderWindow::makeMenu(bool background)
{
    const std::vector<LPCITEMIDLIST> selected = background ? std::vector<LPCITEMIDLIST>() : selectedItems();
    MenuTarget target = MenuTarget::background;
    if (!selected.empty())
        target = folder_.path.empty()                                      ? MenuTarget::drive
                 : items_[static_cast<std::size_t>(chosenItem())].isFolder ? MenuTarget::folder
                                                                           : MenuTarget::file;
    auto menu = std::make_unique<ShellMenu>(window_, folder_, target, selected, output_);
    output_.line(target == MenuTarget::background ? L"menu of the background"
                                                  : L"menu of " + std::to_wstring(selected.size()) + L" selected");
    for (const std::wstring& line : menu->describe())
        output_.line(L"  " + line);
    return menu;
}

void FolderWindow::showMenu(POINT at)
{
    const auto menu = makeMenu(false);
    SetForegroundWindow(window_);
    shownMenu_ = menu.get();
    const auto chosen = TrackPopupMenuEx(menu->handle(), TPM_RETURNCMD | TPM_RIGHTBUTTON, at.x, at.y, window_, nullptr);
    shownMenu_ = nullptr;
    showStatus();
    if (chosen)
        perform(*menu, static_cast<UINT>(chosen));
}

void FolderWindow::invoke(bool background, const std::wstring& text)
{
    const auto menu = makeMenu(background);
    const UINT chosen = menu->findText(text);
    if (!chosen)
        throw Failure{L"the menu has no item " + text};
    perform(*menu, chosen);
}

HPROPSHEETPAGE FolderWindow::makePage(const std::wstring& classId)
{
    CLSID id = {};
    check(CLSIDFromString(classId.c_str(), &id), L"no class " + classId);
    ComPtr<IShellExtInit> handler;
    check(CoCreateInstance(id, nullptr, CLSCTX_INPROC_SERVER, IID_IShellExtInit,
                           reinterpret_cast<void**>(handler.GetAddressOf())),
          L"no object of " + classId);
    check(handler->Initialize(nullptr, dataObject(window_, folder_, selectedItems()).Get(), nullptr),
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
    sheet.pszCaption = L"Page";
    sheet.nPages = 1;
    sheet.phpage = &page;
    PropertySheetW(&sheet);
}

void FolderWindow::stopFreeing()
{
    KillTimer(window_, kIdleTimer);
}

void FolderWindow::perform(const ShellMenu& menu, UINT chosen)
{
    switch (chosen) {
    case openCommand:
        activate(items_[static_cast<std::size_t>(nextSelected(-1))]);
        break;
    case refreshCommand:
        refresh();
        break;
    case selectAllCommand:
        selectAll(true);
        break;
    default:
        output_.line(L"invoked: " + hexCode(menu.invoke(chosen, window_)));
    }
}

void FolderWindow::showStatus()
{
    const auto selected = send(list_, LVM_GETSELECTEDCOUNT);
    std::wstring text = std::to_wstring(items_.size()) + (items_.size() == 1 ? L" item" : L" items");
    if (selected > 0)
        text += L", " + std::to_wstring(selected) + L" selected";
    SetWindowTextW(status_, text.c_str());
}

} // namespace filemanager
