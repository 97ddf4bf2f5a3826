#include "ShellMenu.h"

#include <algorithm>
#include <chrono>

namespace filemanager {
namespace {

constexpr UINT kLastCommand = 0x7FFF;

struct OwnItem {
    OwnCommand command;
    UINT flags;
    const wchar_t* text;
    const wchar_t* help;
};
constexpr OwnItem kOwnItems[] = {
    {openCommand, MF_STRING, L"&Open", L"Opens the selected item."},
    {refreshCommand, MF_STRING, L"R&efresh", L"Reads the folder again."},
    {selectAllCommand, MF_STRING, L"Select &All", L"Selects every item of the folder."},
    {propertiesCommand, MF_STRING | MF_GRAYED, L"P&roperties", L"Shows the properties of the selected items."},
};

const OwnItem* findOwnItem(UINT command)
{
    const auto found = std::find_if(std::begin(kOwnItems), std::end(kOwnItems),
                                    [command](const OwnItem& item) { return item.command == command; });
    return found == std::end(kOwnItems) ? nullptr : found;
}

// The classes of HKEY_CLASSES_ROOT whose handlers the shell asks, by what was clicked.
std::vector<const wchar_t*> classesOf(MenuTarget target, const Folder& folder)
{
    switch (target) {
    case MenuTarget::file:
        return {L"*", L"AllFilesystemObjects"};
    case MenuTarget::folder:
        return {L"AllFilesystemObjects", L"Directory", L"Folder"};
    case MenuTarget::drive:
        return {L"Drive", L"Folder"};
    case MenuTarget::background:
        break;
    }
    // The list of drives is no directory.
    if (folder.path.empty())
        return {};
    return {L"Directory\\Background"};
}

struct KeyCloser {
    void operator()(HKEY key) const noexcept
    {
        RegCloseKey(key);
    }
};
using Key = std::unique_ptr<std::remove_pointer_t<HKEY>, KeyCloser>;

Key openKey(HKEY parent, const wchar_t* name)
{
    HKEY key = nullptr;
    return Key(RegOpenKeyExW(parent, name, 0, KEY_READ, &key) == ERROR_SUCCESS ? key : nullptr);
}

// A handler's key names its class in its default value, or is named after it.
bool handlerClass(HKEY handlers, const wchar_t* name, CLSID& clsid)
{
    wchar_t value[64] = L"";
    DWORD bytes = sizeof value;
    return (RegGetValueW(handlers, name, nullptr, RRF_RT_REG_SZ, nullptr, value, &bytes) == ERROR_SUCCESS &&
            SUCCEEDED(CLSIDFromString(value, &clsid))) ||
           SUCCEEDED(CLSIDFromString(name, &clsid));
}

MENUITEMINFOW itemInfo(HMENU menu, UINT position, wchar_t* text, UINT capacity)
{
    MENUITEMINFOW info = {};
    info.cbSize = sizeof info;
    info.fMask = MIIM_FTYPE | MIIM_ID | MIIM_STATE | MIIM_STRING | MIIM_CHECKMARKS | MIIM_BITMAP;
    info.dwTypeData = text;
    info.cch = capacity;
    GetMenuItemInfoW(menu, position, TRUE, &info);
    return info;
}

std::wstring withoutMnemonic(const wchar_t* text)
{
    std::wstring plain;
    for (; *text; ++text) {
        if (*text == L'&' && *++text == L'\0')
            break;
        plain += *text;
    }
    return plain;
}

} // namespace

ComPtr<IDataObject> dataObject(HWND owner, const Folder& folder, std::vector<LPCITEMIDLIST> items)
{
    ComPtr<IDataObject> data;
    const HRESULT result =
        folder.object->GetUIObjectOf(owner, static_cast<UINT>(items.size()), items.data(), IID_IDataObject, nullptr,
                                     reinterpret_cast<void**>(data.GetAddressOf()));
    if (FAILED(result))
        throw Failure{L"no data object for the selection: " + hexCode(result)};
    return data;
}

ShellMenu::ShellMenu(HWND owner, const Folder& folder, MenuTarget target, const std::vector<LPCITEMIDLIST>& items,
                     Output& output)
    : popup_(nullptr), output_(output)
{
    const bool onBackground = target == MenuTarget::background;
    ComPtr<IDataObject> data;
    if (!onBackground)
        data = dataObject(owner, folder, items);
    popup_ = CreatePopupMenu();
    if (onBackground) {
        append(refreshCommand);
        append(selectAllCommand);
    } else {
        append(openCommand);
        SetMenuDefaultItem(popup_, openCommand, FALSE);
    }

    const auto start = std::chrono::steady_clock::now();
    std::vector<CLSID> seen;
    for (const wchar_t* const className : classesOf(target, folder)) {
        const Key classKey = openKey(HKEY_CLASSES_ROOT, className);
        const Key handlers = classKey ? openKey(classKey.get(), L"shellex\\ContextMenuHandlers") : nullptr;
        wchar_t name[256];
        for (DWORD index = 0; handlers && RegEnumKeyW(handlers.get(), index, name, 256) == ERROR_SUCCESS; ++index) {
            CLSID clsid;
            if (!handlerClass(handlers.get(), name, clsid) || std::find(seen.begin(), seen.end(), clsid) != seen.end())
                continue;
            seen.push_back(clsid);
            addHandler(clsid, classKey.get(), onBackground ? &folder : nullptr, data.Get());
        }
    }
    handlerMicroseconds_ =
        std::chrono::duration_cast<std::chrono::microseconds>(std::chrono::steady_clock::now() - start).count();

    AppendMenuW(popup_, MF_SEPARATOR, 0, nullptr);
    append(propertiesCommand);
    removeSpareSeparators();
}

ShellMenu::~ShellMenu()
{
    DestroyMenu(popup_);
}

void ShellMenu::addHandler(REFCLSID clsid, HKEY classKey, const Folder* background, IDataObject* data)
{
    wchar_t name[64] = L"";
    StringFromGUID2(clsid, name, 64);
    ComPtr<IShellExtInit> handler;
    HRESULT result = CoCreateInstance(clsid, nullptr, CLSCTX_INPROC_SERVER, IID_IShellExtInit,
                                      reinterpret_cast<void**>(handler.GetAddressOf()));
    // The shell names the folder for a background only: elsewhere the data object says it all.
    if (SUCCEEDED(result))
        result = handler->Initialize(background ? background->idList.get() : nullptr, data, classKey);
    ComPtr<IContextMenu> menu;
    if (SUCCEEDED(result))
        result = handler.CopyTo(IID_IContextMenu, reinterpret_cast<void**>(menu.GetAddressOf()));
    if (SUCCEEDED(result))
        result = menu->QueryContextMenu(popup_, static_cast<UINT>(GetMenuItemCount(popup_)), nextCommand_, kLastCommand,
                                        CMF_EXPLORE);
    if (FAILED(result)) {
        output_.error(L"handler " + std::wstring(name) + L" failed: " + hexCode(result));
        return;
    }
    const auto count = static_cast<UINT>(HRESULT_CODE(result));
    handlers_.push_back({menu, nextCommand_, count});
    nextCommand_ += count;
}

void ShellMenu::append(UINT command)
{
    const OwnItem& item = *findOwnItem(command);
    AppendMenuW(popup_, item.flags, item.command, item.text);
}

void ShellMenu::removeSpareSeparators()
{
    const auto isSeparator = [this](int at) {
        return (GetMenuState(popup_, static_cast<UINT>(at), MF_BYPOSITION) & MF_SEPARATOR) != 0;
    };
    for (int at = GetMenuItemCount(popup_) - 1; at >= 0; --at) {
        const bool last = at == GetMenuItemCount(popup_) - 1;
        if (isSeparator(at) && (at == 0 || last || isSeparator(at + 1)))
            RemoveMenu(popup_, static_cast<UINT>(at), MF_BYPOSITION);
    }
}

std::vector<std::wstring> ShellMenu::describe() const
{
    std::vector<std::wstring> lines;
    const auto count = static_cast<UINT>(GetMenuItemCount(popup_));
    for (UINT at = 0; at < count; ++at) {
        wchar_t text[256] = L"";
        const MENUITEMINFOW info = itemInfo(popup_, at, text, 256);
        if (info.fType & MFT_SEPARATOR) {
            lines.emplace_back(L"--------");
            continue;
        }
        std::wstring line = withoutMnemonic(text);
        if (info.fState & MFS_GRAYED)
            line += L" [greyed]";
        if (info.hbmpUnchecked || info.hbmpItem)
            line += L" [bitmap]";
        if (const auto verb = commandString(info.wID, GCS_VERBW); !verb.empty())
            line += L" verb=" + verb;
        if (const auto help = helpText(info.wID); !help.empty())
            line += L" help=\"" + help + L"\"";
        lines.push_back(line);
    }
    return lines;
}

UINT ShellMenu::findText(const std::wstring& text) const
{
    const auto count = static_cast<UINT>(GetMenuItemCount(popup_));
    for (UINT at = 0; at < count; ++at) {
        wchar_t found[256] = L"";
        const MENUITEMINFOW info = itemInfo(popup_, at, found, 256);
        if (!(info.fType & MFT_SEPARATOR) && !(info.fState & MFS_GRAYED) && withoutMnemonic(found) == text)
            return info.wID;
    }
    return 0;
}

std::wstring ShellMenu::helpText(UINT command) const
{
    const OwnItem* const own = findOwnItem(command);
    return own ? own->help : commandString(command, GCS_HELPTEXTW);
}

HRESULT ShellMenu::invoke(UINT command, HWND owner) const
{
    const Handler* const handler = handlerOf(command);
    if (!handler)
        return E_INVALIDARG;
    CMINVOKECOMMANDINFO info = {};
    info.cbSize = sizeof info;
    info.hwnd = owner;
    info.lpVerb = MAKEINTRESOURCEA(command - handler->first);
    info.nShow = SW_SHOWNORMAL;
    return handler->menu->InvokeCommand(&info);
}

const ShellMenu::Handler* ShellMenu::handlerOf(UINT command) const
{
    const auto found = std::find_if(handlers_.begin(), handlers_.end(), [command](const Handler& handler) {
        return command >= handler.first && command - handler.first < handler.count;
    });
    return found == handlers_.end() ? nullptr : &*found;
}

std::wstring ShellMenu::commandString(UINT command, UINT type) const
{
    const Handler* const handler = handlerOf(command);
    wchar_t text[512] = L"";
    if (handler)
        handler->menu->GetCommandString(command - handler->first, type, nullptr, reinterpret_cast<LPSTR>(text), 512);
    return text;
}

} // namespace filemanager
