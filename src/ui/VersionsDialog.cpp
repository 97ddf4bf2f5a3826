#include "ui/VersionsDialog.h"

#include <string>
#include <unordered_set>
#include <utility>
#include <vector>

#include <commctrl.h>
#include <wx/datetime.h>
#include <wx/intl.h>

#include "core/Boundary.h"
#include "core/DisplayFormat.h"
#include "core/Handles.h"
#include "core/ScopeGuard.h"
#include "core/Utf8.h"
#include "restore/RestoreRequest.h"
#include "ui/ActivationScope.h"
#include "ui/CopyTarget.h"
#include "ui/DialogLayout.h"
#include "ui/LocalePattern.h"
#include "ui/resource.h"
#include "ui/RestoreProgressWindow.h"
#include "ui/Translations.h"

namespace tavi {
namespace {

// The reserved manifest path whose versions are the backup runs.
constexpr const wchar_t* kBackupRuns = L"simple.map";

struct VersionRow {
    ManifestPatch patch;
    bool isNewest;
};

std::vector<VersionRow> listVersions(const ManifestPatchList& patches)
{
    std::vector<VersionRow> rows;
    std::unordered_set<std::uint32_t> times;
    rows.reserve(patches.size());
    for (std::size_t i = 0; i < patches.size(); ++i) {
        const ManifestPatch patch = patches[i];
        if (!patch.isDeletion() && times.insert(patch.timestamp()).second)
            rows.push_back({patch, i + 1 == patches.size()});
    }
    return rows;
}

wxString formatTime(std::uint32_t seconds, const wxString& pattern)
{
    return wxDateTime(wxLongLong(static_cast<wxLongLong_t>(seconds) * 1000)).Format(pattern);
}

// Returns the name with an ellipsis in place of its middle, so that `kept` characters remain. Keeps surrogate pairs
// whole.
wxString shortenMiddle(const wxString& name, std::size_t kept)
{
    if (kept >= name.length())
        return name;
    const std::wstring_view text = view(name);
    std::size_t head = kept - kept / 2;
    std::size_t tail = text.length() - kept / 2;
    if (head > 0 && IS_HIGH_SURROGATE(text[head - 1]))
        --head;
    if (tail < text.length() && IS_LOW_SURROGATE(text[tail]))
        ++tail;
    return wxString(text.data(), head) + L"\u2026" + wxString(text.data() + tail, text.length() - tail);
}

} // namespace

VersionsDialog::VersionsDialog(Selection selection, ManifestRef manifest)
    : paths_(std::move(selection.paths)), coverage_(selection.restoreMode), manifest_(std::move(manifest))
{
    loadTranslations();
    if (paths_.size() == 1 && !selection.hasFolder)
        singleFile_ = *paths_.begin();
}

void VersionsDialog::handleMessage(HWND window, UINT message, LPARAM lParam)
{
    const ActivationScope activation;
    if (message == WM_INITDIALOG) {
        window_ = window;
        initialize();
    } else if (message == WM_NOTIFY) {
        const auto& change = *reinterpret_cast<const NMLISTVIEW*>(lParam);
        if (change.hdr.idFrom == TAVI_VERSIONS_LIST && change.hdr.code == LVN_ITEMCHANGED &&
            (change.uChanged & LVIF_STATE))
            enableActions((change.uNewState & LVIS_SELECTED) != 0);
    }
}

HWND VersionsDialog::list() const
{
    return GetDlgItem(window_, TAVI_VERSIONS_LIST);
}

void VersionsDialog::initialize()
{
    setTexts();
    SendMessageW(list(), LVM_SETEXTENDEDLISTVIEWSTYLE, 0, LVS_EX_FULLROWSELECT | LVS_EX_DOUBLEBUFFER);
    addColumns();
    addRows();
    SendMessageW(window_, DM_SETDEFID, TAVI_VERSIONS_RESTORE, 0);
}

void VersionsDialog::setTexts()
{
    const std::pair<int, wxString> texts[] = {
        {TAVI_VERSIONS_LABEL, isSingleFile() ? _("File &Versions:") : _("Available &Versions:")},
        {TAVI_VERSIONS_VIEW, _("&View")},
        {TAVI_VERSIONS_COPY_TO, _("&Copy To...")},
        {TAVI_VERSIONS_RESTORE, _("&Restore")},
        {IDCANCEL, _("&Cancel")},
    };
    for (const auto& [id, text] : texts)
        SetDlgItemTextW(window_, id, text.wc_str());

    wxString message;
    if (isSingleFile())
        message = fitName(_("The following versions of %s are backed up on the Tavi servers.  You can select one and "
                            "restore it, or copy it to a different location."),
                          singleFile_.AfterLast(L'\\'));
    else if (coverage_ == Coverage::all)
        message =
            _("The following versions of the items you selected are backed up on the Tavi servers.  You can select "
              "one and restore the files, or copy them to a different location.");
    else
        message =
            _("The following versions of some of the items you selected are backed up on the Tavi servers.  You can "
              "select one and restore the available files, or copy them to a different location.");
    SetDlgItemTextW(window_, TAVI_VERSIONS_MESSAGE, message.wc_str());
    if (!isTranslated())
        return;
    fitMessage(window_, TAVI_VERSIONS_MESSAGE, TAVI_VERSIONS_LABEL, TAVI_VERSIONS_LIST);
    fitButtons(window_, {IDCANCEL, TAVI_VERSIONS_RESTORE, TAVI_VERSIONS_COPY_TO, TAVI_VERSIONS_VIEW});
}

wxString VersionsDialog::fitName(const wxString& text, const wxString& name) const
{
    const HWND control = GetDlgItem(window_, TAVI_VERSIONS_MESSAGE);
    RECT room{};
    GetClientRect(control, &room);
    const TextRuler ruler(control);
    const auto fits = [&](std::size_t kept) {
        const SIZE needed = ruler.measure(withName(text, shortenMiddle(name, kept)), room.right, DT_NOPREFIX);
        return needed.cx <= room.right && needed.cy <= room.bottom;
    };
    // A binary search for the most characters with which the text still fits.
    std::size_t kept = name.length();
    if (!fits(kept)) {
        std::size_t tooMany = kept;
        for (kept = 0; tooMany - kept > 1;) {
            const std::size_t middle = (kept + tooMany) / 2;
            (fits(middle) ? kept : tooMany) = middle;
        }
    }
    return withName(text, shortenMiddle(name, kept));
}

void VersionsDialog::addColumns()
{
    const ScreenDc dc(GetDC(nullptr));
    const int dpi = dc ? GetDeviceCaps(dc.get(), LOGPIXELSX) : USER_DEFAULT_SCREEN_DPI;
    const auto add = [&](int index, int width, const wxString& title) {
        LVCOLUMNW column{};
        column.mask = LVCF_FMT | LVCF_WIDTH | LVCF_TEXT | LVCF_SUBITEM;
        column.fmt = LVCFMT_LEFT;
        column.cx = MulDiv(width, dpi, USER_DEFAULT_SCREEN_DPI);
        column.pszText = const_cast<wchar_t*>(static_cast<const wchar_t*>(title.wc_str()));
        column.iSubItem = index;
        SendMessageW(list(), LVM_INSERTCOLUMNW, static_cast<WPARAM>(index), reinterpret_cast<LPARAM>(&column));
    };
    add(0, 125, _("Backup Time"));
    if (isSingleFile()) {
        add(1, 125, _("Modified Time"));
        add(2, 75, _("File Size"));
    }
}

void VersionsDialog::addRows()
{
    const auto patches = manifest_->findPatches(isSingleFile() ? view(singleFile_) : std::wstring_view(kBackupRuns));
    const std::vector<VersionRow> rows = patches ? listVersions(*patches) : std::vector<VersionRow>();
    const wxString pattern = localeDateTimePattern();
    const HWND control = list();
    SendMessageW(control, WM_SETREDRAW, FALSE, 0);
    SendMessageW(control, LVM_SETITEMCOUNT, rows.size(), 0);
    bool selected = false;
    for (std::size_t i = 0; i < rows.size(); ++i) {
        const ManifestPatch& patch = rows[i].patch;
        const auto setText = [&](LVITEMW& item, const wxString& text) {
            item.pszText = const_cast<wchar_t*>(static_cast<const wchar_t*>(text.wc_str()));
        };
        const wxString time = formatTime(patch.timestamp(), pattern);
        LVITEMW item{};
        item.mask = LVIF_TEXT | LVIF_PARAM | LVIF_STATE;
        item.iItem = static_cast<int>(i);
        item.lParam = static_cast<LPARAM>(patch.timestamp());
        item.stateMask = LVIS_SELECTED | LVIS_FOCUSED;
        item.state = rows[i].isNewest ? item.stateMask : 0;
        setText(item, time);
        SendMessageW(control, LVM_INSERTITEMW, 0, reinterpret_cast<LPARAM>(&item));
        selected |= rows[i].isNewest;
        if (!isSingleFile())
            continue;
        const wxString details[] = {formatTime(patch.modifiedTime(), pattern), formatSize(patch.fileSize())};
        item.mask = LVIF_TEXT;
        for (const wxString& detail : details) {
            ++item.iSubItem;
            setText(item, detail);
            SendMessageW(control, LVM_SETITEMW, 0, reinterpret_cast<LPARAM>(&item));
        }
    }
    SendMessageW(control, WM_SETREDRAW, TRUE, 0);
    if (selected)
        SendMessageW(control, LVM_ENSUREVISIBLE, rows.size() - 1, FALSE);
    // Some versions of the control send no LVN_ITEMCHANGED for a row that is inserted selected.
    enableActions(selected);
}

void VersionsDialog::enableActions(bool enabled) const
{
    EnableWindow(GetDlgItem(window_, TAVI_VERSIONS_RESTORE), enabled);
    EnableWindow(GetDlgItem(window_, TAVI_VERSIONS_COPY_TO), enabled);
}

bool VersionsDialog::runCommand(UINT id)
{
    const bool closes = id == IDCANCEL || id == TAVI_VERSIONS_RESTORE || id == TAVI_VERSIONS_COPY_TO;
    // A box disables the dialog, but a message from another program still arrives and must not open a second box.
    if (!closes || isBusy_)
        return false;
    isBusy_ = true;
    const ScopeGuard done([&] { isBusy_ = false; });
    const ActivationScope activation;
    guarded("versions dialog command", [&] {
        if (id == TAVI_VERSIONS_RESTORE)
            restoreInPlace();
        else if (id == TAVI_VERSIONS_COPY_TO)
            isSingleFile() ? copyFile() : copyToFolder();
    });
    // The window may be destroyed while the box is open.
    return IsWindow(window_);
}

std::optional<bool> VersionsDialog::askOverwrite(const wxString& question, UINT icon) const
{
    const UINT direction = isRightToLeft() ? MB_RTLREADING | MB_RIGHT : 0;
    const int answer =
        MessageBoxW(window_, question.wc_str(), _("Tavi Remote Backup").wc_str(), MB_YESNOCANCEL | icon | direction);
    if (answer != IDYES && answer != IDNO)
        return std::nullopt;
    return answer == IDYES;
}

void VersionsDialog::restoreInPlace()
{
    // The second text ends in "it", too: existing catalogues translate that text.
    const auto overwrite =
        askOverwrite(isSingleFile() ? _("Restoring this file will overwrite your current version, and you will lose "
                                        "any changes\r\nthat have been "
                                        "made since it was last backed up.  Would you like to overwrite it?")
                                    : _("Restoring these files will overwrite your current versions, and you will lose "
                                        "any changes\r\nthat have "
                                        "been made since they were last backed up.  Would you like to overwrite it?"),
                     MB_ICONWARNING);
    if (overwrite)
        request(commonPrefix(paths_), wxString(), *overwrite);
}

void VersionsDialog::copyFile()
{
    // The save box has asked the user before it accepts the name of an existing file.
    if (const auto target = askFileName(window_, singleFile_))
        request(singleFile_, *target, true);
}

void VersionsDialog::copyToFolder()
{
    const auto folder = askFolder(window_);
    if (!folder)
        return;
    const wxString prefix = commonPrefix(paths_);
    bool overwrite = false;
    if (anyTargetExists(paths_, prefix, *folder)) {
        const auto answer =
            askOverwrite(_("One or more of the items you selected already exist.  Would you like to overwrite "
                           "those files, restore to a different filename, or cancel?"),
                         0);
        if (!answer)
            return;
        overwrite = *answer;
    }
    request(prefix, *folder, overwrite);
}

std::optional<std::uint32_t> VersionsDialog::selectedTime() const
{
    LVITEMW item{};
    item.mask = LVIF_PARAM;
    item.iItem = static_cast<int>(SendMessageW(list(), LVM_GETNEXTITEM, static_cast<WPARAM>(-1), LVNI_SELECTED));
    if (!IsWindow(window_) || item.iItem < 0 || !SendMessageW(list(), LVM_GETITEMW, 0, reinterpret_cast<LPARAM>(&item)))
        return std::nullopt;
    return static_cast<std::uint32_t>(item.lParam);
}

void VersionsDialog::request(const wxString& sourcePrefix, const wxString& destination, bool overwrite)
{
    const auto time = selectedTime();
    if (!time)
        return;
    RestoreRequest request;
    request.selectedPaths = paths_;
    request.cutoffTime = *time;
    request.sourcePrefix = sourcePrefix;
    request.destinationFolder = destination;
    request.overwrite = overwrite;
    SetCursor(LoadCursorW(nullptr, IDC_WAIT));
    performRestore(request, *manifest_);
    // Also if the request failed, which is only logged: the user sees a window that waits, and can close it.
    RestoreProgressWindow::getOrCreate();
}

} // namespace tavi
