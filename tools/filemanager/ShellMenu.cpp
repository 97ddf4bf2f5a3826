#include "ShellMenu.h"

#include <algorithm>
#include <chrono>

#include "common/Text.h"

namespace filemanager {
namespace {

constexpr UINT kLastHandlerCommand = 0x7FFF;

// Returns the classes of HKEY_CLASSES_ROOT whose handlers the shell asks.
std::vector<const wchar_t*> classesOf(MenuTarget target)
{
    switch (target) {
    case MenuTarget::file:
        return {L"*", L"AllFilesystemObjects"};
    case MenuTarget::folder:
        return {L"AllFilesystemObjects", L"Directory", L"Folder"};
    case MenuTarget::background:
        break;
    }
    return {L"Directory\\Background"};
}

struct KeyCloser {
    void operator()(HKEY key) const noexcept
    {
        RegCloseKey(key);
    }
};
using Key = std::unique_ptr<std::remove_pointer_t<HKEY>, KeyCloser>;

Key openKey(HKEY parent, const std::wstring& name)
{
    HKEY key = nullptr;
    return Key(RegOpenKeyExW(parent, name.c_str(), 0, KEY_READ, &key) == ERROR_SUCCESS ? key : nullptr);
}

// A handler's key has the class identifier as its default value or as its name.
bool handlerClass(HKEY handlers, const wchar_t* name, CLSID& clsid)
{
    wchar_t value[64] = L"";
    DWORD bytes = sizeof value;
    return (RegGetValueW(handlers, name, nullptr, RRF_RT_REG_SZ, nullptr, value, &bytes) == ERROR_SUCCESS &&
            SUCCEEDED(CLSIDFromString(value, &clsid))) ||
           SUCCEEDED(CLSIDFromString(name, &clsid));
}

struct MenuItem {
    MENUITEMINFOW info = {};
    std::wstring text;
};

MenuItem itemAt(HMENU menu, UINT position)
{
    wchar_t text[256] = L"";
    MenuItem item;
    item.info.cbSize = sizeof item.info;
    item.info.fMask = MIIM_FTYPE | MIIM_ID | MIIM_STATE | MIIM_STRING | MIIM_CHECKMARKS;
    item.info.dwTypeData = text;
    item.info.cch = 256;
    GetMenuItemInfoW(menu, position, TRUE, &item.info);
    item.text = text;
    item.text.erase(std::remove(item.text.begin(), item.text.end(), L'&'), item.text.end());
    return item;
}

std::wstring hexCode(HRESULT result)
{
    wchar_t text[16];
    wsprintfW(text, L"0x%08x", static_cast<unsigned>(result));
    return text;
}

} // namespace

void check(HRESULT result, const std::wstring& what)
{
    if (FAILED(result))
        throw tools::Failure{what + L": " + hexCode(result)};
}

ComPtr<IDataObject> dataObject(HWND owner, const Folder& folder, std::vector<LPCITEMIDLIST> items)
{
    ComPtr<IDataObject> data;
    check(folder.object->GetUIObjectOf(owner, static_cast<UINT>(items.size()), items.data(), IID_IDataObject, nullptr,
                                       reinterpret_cast<void**>(data.GetAddressOf())),
          L"no data object for the selection");
    return data;
}

ShellMenu::ShellMenu(HWND owner, const Folder& folder, MenuTarget target, const std::vector<LPCITEMIDLIST>& items)
{
    const bool onBackground = target == MenuTarget::background;
    const auto data = onBackground ? ComPtr<IDataObject>() : dataObject(owner, folder, items);
    popup_ = CreatePopupMenu();
    if (onBackground) {
        AppendMenuW(popup_, MF_STRING, kRefreshCommand, L"R&efresh");
    } else {
        AppendMenuW(popup_, MF_STRING, kOpenCommand, L"&Open");
        SetMenuDefaultItem(popup_, kOpenCommand, FALSE);
    }
    const auto start = std::chrono::steady_clock::now();
    addHandlers(target, folder, data.Get());
    handlerMicroseconds_ =
        std::chrono::duration_cast<std::chrono::microseconds>(std::chrono::steady_clock::now() - start).count();
    AppendMenuW(popup_, MF_SEPARATOR, 0, nullptr);
    AppendMenuW(popup_, MF_STRING | MF_GRAYED, kPropertiesCommand, L"P&roperties");
    removeDoubleSeparators();
}

ShellMenu::~ShellMenu()
{
    DestroyMenu(popup_);
}

void ShellMenu::addHandlers(MenuTarget target, const Folder& folder, IDataObject* data)
{
    std::vector<CLSID> seen;
    for (const wchar_t* const className : classesOf(target)) {
        const Key classKey = openKey(HKEY_CLASSES_ROOT, className);
        const Key handlers = openKey(HKEY_CLASSES_ROOT, className + std::wstring(L"\\shellex\\ContextMenuHandlers"));
        wchar_t name[256];
        for (DWORD index = 0; handlers && RegEnumKeyW(handlers.get(), index, name, 256) == ERROR_SUCCESS; ++index) {
            CLSID clsid;
            if (!handlerClass(handlers.get(), name, clsid) || std::find(seen.begin(), seen.end(), clsid) != seen.end())
                continue;
            seen.push_back(clsid);
            // The shell passes the folder for a background only; elsewhere the data object is enough.
            addHandler(clsid, classKey.get(), data ? nullptr : folder.idList.get(), data);
        }
    }
}

void ShellMenu::addHandler(REFCLSID clsid, HKEY classKey, LPCITEMIDLIST folder, IDataObject* data)
{
    ComPtr<IShellExtInit> handler;
    ComPtr<IContextMenu> menu;
    HRESULT result = CoCreateInstance(clsid, nullptr, CLSCTX_INPROC_SERVER, IID_IShellExtInit,
                                      reinterpret_cast<void**>(handler.GetAddressOf()));
    if (SUCCEEDED(result))
        result = handler->Initialize(folder, data, classKey);
    if (SUCCEEDED(result))
        result = handler.CopyTo(IID_IContextMenu, reinterpret_cast<void**>(menu.GetAddressOf()));
    if (SUCCEEDED(result))
        result = menu->QueryContextMenu(popup_, static_cast<UINT>(GetMenuItemCount(popup_)), nextCommand_,
                                        kLastHandlerCommand, CMF_EXPLORE);
    if (FAILED(result)) {
        tools::printError(L"a handler failed: " + hexCode(result));
        return;
    }
    const auto count = static_cast<UINT>(HRESULT_CODE(result));
    handlers_.push_back({menu, nextCommand_, count});
    nextCommand_ += count;
}

// A handler begins its part with a separator even if nothing follows it.
void ShellMenu::removeDoubleSeparators()
{
    const auto isSeparator = [this](UINT at) { return (GetMenuState(popup_, at, MF_BYPOSITION) & MF_SEPARATOR) != 0; };
    for (auto at = static_cast<UINT>(GetMenuItemCount(popup_)) - 1; at > 0; --at) {
        if (isSeparator(at) && isSeparator(at - 1))
            RemoveMenu(popup_, at, MF_BYPOSITION);
    }
}

void ShellMenu::print() const
{
    tools::print(L"menu:");
    const auto count = static_cast<UINT>(GetMenuItemCount(popup_));
    for (UINT at = 0; at < count; ++at) {
        const auto [info, text] = itemAt(popup_, at);
        std::wstring line = info.fType & MFT_SEPARATOR ? L"  --------" : L"  " + text;
        if (info.fState & MFS_GRAYED)
            line += L" [greyed]";
        if (info.hbmpUnchecked)
            line += L" [bitmap]";
        if (const auto verb = commandString(info.wID, GCS_VERBW); !verb.empty())
            line += L" verb=" + verb;
        if (const auto help = helpText(info.wID); !help.empty())
            line += L" help=\"" + help + L"\"";
        tools::print(line);
    }
}

UINT ShellMenu::findText(const std::wstring& text) const
{
    const auto count = static_cast<UINT>(GetMenuItemCount(popup_));
    for (UINT at = 0; at < count; ++at) {
        if (const MenuItem item = itemAt(popup_, at); item.text == text && !(item.info.fState & MFS_GRAYED))
            return item.info.wID;
    }
    return 0;
}

std::wstring ShellMenu::helpText(UINT command) const
{
    return commandString(command, GCS_HELPTEXTW);
}

void ShellMenu::invoke(UINT command, HWND owner) const
{
    const Handler* const handler = handlerOf(command);
    CMINVOKECOMMANDINFO info = {};
    info.cbSize = sizeof info;
    info.hwnd = owner;
    info.lpVerb = handler ? MAKEINTRESOURCEA(command - handler->first) : nullptr;
    info.nShow = SW_SHOWNORMAL;
    check(handler ? handler->menu->InvokeCommand(&info) : E_INVALIDARG, L"the command was not performed");
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
