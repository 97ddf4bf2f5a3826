#include "ui/ContextMenu.h"

#include <string>
#include <utility>

// Without this the header bans the C string functions that the headers of wxWidgets call.
#define STRSAFE_NO_DEPRECATE
#include <strsafe.h>
#include <wx/intl.h>

#include "core/DisplayFormat.h"
#include "manifest/CurrentManifest.h"
#include "ui/ActivationScope.h"
#include "ui/MenuBitmap.h"
#include "ui/resource.h"
#include "ui/Translations.h"
#include "ui/VersionsWindow.h"

namespace tavi {
namespace {

struct Wording {
    const char* oneFile;
    const char* oneFolder;
    const char* severalFiles;
    const char* severalFolders;

    // The texts for one item have a %s for its name.
    wxString text(const Selection& selection) const
    {
        const wxString& name = selection.displayName;
        if (name.empty())
            return wxGetTranslation(selection.hasFolder ? severalFolders : severalFiles);
        return withName(wxGetTranslation(selection.hasFolder ? oneFolder : oneFile), name);
    }
};

bool hasVersions(const Selection& selection)
{
    return selection.restoreMode != Coverage::none;
}

void restore(const Selection& selection, HWND host)
{
    // Without a manifest there is nothing to choose from. The window gets a copy of the selection: the host may invoke
    // the command again.
    if (ManifestRef manifest = getCurrentManifest())
        openVersionsWindow(selection, std::move(manifest), host);
}

struct Command {
    const wchar_t* verb;
    // Returns whether the menu shows the command. Null for a command that is never shown.
    bool (*isShown)(const Selection&);
    // Null for a command that does nothing.
    void (*invoke)(const Selection&, HWND host);
    Wording label;
    Wording help;
};

// The index of a command is its offset from the first id that the host gives to the menu. The two backup commands do
// nothing and are on no menu, but a host may ask for their verbs and help texts, and message catalogues translate their
// labels.
const Command kCommands[] = {
    {L"TaviRestore",
     hasVersions,
     restore,
     {wxTRANSLATE("Restore Previous Version"), wxTRANSLATE("Restore Files in Folder"),
      wxTRANSLATE("Restore Previous Versions"), wxTRANSLATE("Restore Files")},
     {wxTRANSLATE("Restore an older version of %s from the Tavi servers."),
      wxTRANSLATE("Restore files in %s from the Tavi servers."),
      wxTRANSLATE("Restore older versions of the selected files."),
      wxTRANSLATE("Restore older versions of the selected files.")}},
    {L"TaviBackup",
     nullptr,
     nullptr,
     {wxTRANSLATE("&Backup %s"), wxTRANSLATE("&Backup %s"), wxTRANSLATE("&Backup Selected Items"),
      wxTRANSLATE("&Backup Selected Items")},
     {wxTRANSLATE("Marks %s to be backed up with Tavi Remote Backup."),
      wxTRANSLATE("Marks %s to be backed up with Tavi Remote Backup."),
      wxTRANSLATE("Marks the selected items to be backed up with Tavi Remote Backup."),
      wxTRANSLATE("Marks the selected items to be backed up with Tavi Remote Backup.")}},
    {L"TaviDontBackup",
     nullptr,
     nullptr,
     {wxTRANSLATE("&Don't Backup %s"), wxTRANSLATE("&Don't Backup %s"), wxTRANSLATE("&Don't Backup Selected Items"),
      wxTRANSLATE("&Don't Backup Selected Items")},
     {wxTRANSLATE("Removes %s from the Tavi Remote Backup configuration."),
      wxTRANSLATE("Removes %s from the Tavi Remote Backup configuration."),
      wxTRANSLATE("Removes the selected items from the Tavi Remote Backup configuration."),
      wxTRANSLATE("Removes the selected items from the Tavi Remote Backup configuration.")}},
};

std::string toAnsi(const std::wstring& text)
{
    const int length = static_cast<int>(text.length());
    std::string ansi(
        static_cast<std::size_t>(WideCharToMultiByte(CP_ACP, 0, text.data(), length, nullptr, 0, nullptr, nullptr)),
        '\0');
    WideCharToMultiByte(CP_ACP, 0, text.data(), length, ansi.data(), static_cast<int>(ansi.length()), nullptr, nullptr);
    return ansi;
}

void insertCommand(HMENU menu, UINT position, UINT id, const wxString& label)
{
    if (!InsertMenuW(menu, position, MF_BYPOSITION | MF_STRING, id, label.wc_str()))
        return;
    if (const HBITMAP bitmap = menuBitmap(TAVI_ICON_MENU, GetSysColor(COLOR_MENU)))
        SetMenuItemBitmaps(menu, position, MF_BYPOSITION, bitmap, bitmap);
}

} // namespace

UINT insertMenuItems(HMENU menu, UINT indexMenu, UINT idCmdFirst, UINT flags, const Selection& selection)
{
    // Starts the watcher. Keeps the manifest that this menu was built from through a reload, for the command that the
    // user may choose.
    holdManifestForMenu();
    if (flags & (CMF_DEFAULTONLY | CMF_NOVERBS))
        return 0;

    loadTranslations();
    const ActivationScope activation;
    // Also for a selection without versions: the menu keeps its groups, whatever the backup holds.
    InsertMenuW(menu, indexMenu, MF_BYPOSITION | MF_SEPARATOR, 0, nullptr);
    UINT position = indexMenu;
    UINT usedIds = 0;
    for (UINT offset = 0; offset < std::size(kCommands); ++offset) {
        const Command& command = kCommands[offset];
        if (!command.isShown || !command.isShown(selection))
            continue;
        insertCommand(menu, ++position, idCmdFirst + offset, command.label.text(selection));
        usedIds = offset + 1;
    }
    return usedIds;
}

HRESULT commandString(UINT_PTR offset, UINT type, LPSTR buffer, UINT size, const Selection& selection)
{
    if (offset >= std::size(kCommands))
        return E_INVALIDARG;
    loadTranslations();
    const Command& command = kCommands[offset];
    std::wstring text;
    switch (type) {
    case GCS_VERBA:
    case GCS_VERBW:
        text = command.verb;
        break;
    case GCS_HELPTEXTA:
    case GCS_HELPTEXTW:
        text = command.help.text(selection).ToStdWstring();
        break;
    default:
        return S_OK;
    }
    if (!buffer)
        return E_INVALIDARG;
    return type & GCS_UNICODE ? StringCchCopyW(reinterpret_cast<wchar_t*>(buffer), size, text.c_str())
                              : StringCchCopyA(buffer, size, toAnsi(text).c_str());
}

HRESULT invokeCommand(const CMINVOKECOMMANDINFO& info, const Selection& selection)
{
    if (!IS_INTRESOURCE(info.lpVerb))
        return E_INVALIDARG;
    const auto offset = reinterpret_cast<UINT_PTR>(info.lpVerb);
    if (offset >= std::size(kCommands))
        return E_INVALIDARG;
    if (const auto invoke = kCommands[offset].invoke)
        invoke(selection, info.hwnd);
    return S_OK;
}

} // namespace tavi
