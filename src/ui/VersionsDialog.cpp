#include "ui/VersionsDialog.h"

#include <string>
#include <unordered_set>
#include <utility>
#include <vector>

#include <commctrl.h>
#include <ole2.h>
#include <prsht.h>
#include <wx/datetime.h>
#include <wx/intl.h>

#include "core/Boundary.h"
#include "core/DisplayFormat.h"
#include "core/Handles.h"
#include "core/LogLine.h"
#include "core/Module.h"
#include "core/ModuleThread.h"
#include "core/ScopeGuard.h"
#include "core/Utf8.h"
#include "restore/RestoreRequest.h"
#include "ui/ActivationScope.h"
#include "ui/CopyTarget.h"
#include "ui/LocalePattern.h"
#include "ui/resource.h"
#include "ui/RestoreProgressWindow.h"
#include "ui/WindowFrame.h"

namespace tavi {
namespace {

// The reserved manifest path whose versions are the backup runs.
constexpr const wchar_t* kBackupRuns = L"simple.map";

// The shell's folder browser needs OLE on its thread.
class OleScope {
  public:
    OleScope() noexcept : initialized_(SUCCEEDED(OleInitialize(nullptr))) {}
    ~OleScope()
    {
        if (initialized_)
            OleUninitialize();
    }
    OleScope(const OleScope&) = delete;
    OleScope& operator=(const OleScope&) = delete;

  private:
    bool initialized_;
};

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

INT_PTR CALLBACK dialogProcedure(HWND window, UINT message, WPARAM wParam, LPARAM lParam)
{
    return guarded("versions dialog", INT_PTR{FALSE}, [&]() -> INT_PTR {
        auto* const dialog = dialogObject<VersionsDialog>(window, message, lParam);
        return dialog ? dialog->handleMessage(window, message, wParam, lParam) : FALSE;
    });
}

// The argument of a dialog's thread. Counts as an object of the module until the thread's last step.
struct DialogStart {
    ModuleLock lock;
    Selection selection;
    ManifestRef manifest;
    HWND host;
};

void runDialog(void* argument)
{
    const std::unique_ptr<DialogStart> start(static_cast<DialogStart*>(argument));
    const OleScope ole;
    const ActivationScope activation;
    const auto dialog = std::make_shared<VersionsDialog>(std::move(start->selection), std::move(start->manifest), true);
    // No owner: the kernel would join the input queues of this thread and the owner's.
    const WindowHandle window(CreateDialogParamW(moduleInstance(), MAKEINTRESOURCEW(TAVI_DIALOG_VERSIONS), nullptr,
                                                 dialogProcedure, reinterpret_cast<LPARAM>(dialog.get())));
    if (!window) {
        logError(L"Unable to create the versions dialog (%lu)", GetLastError());
        return;
    }
    placeWindow(window.get(), start->host);
    // In this order: a window that gets the focus before the foreground keeps the caption of an inactive window.
    ShowWindow(window.get(), SW_SHOWNA);
    SetForegroundWindow(window.get());
    SetFocus(GetDlgItem(window.get(), TAVI_VERSIONS_LIST));
    runDialogLoop(window.get());
}

} // namespace

bool startVersionsDialog(Selection selection, ManifestRef manifest, HWND host)
{
    std::unique_ptr<DialogStart> start(new DialogStart{{}, std::move(selection), std::move(manifest), host});
    if (!KernelHandle(startModuleThread(runDialog, start.get()))) {
        logError(L"Unable to start the versions dialog");
        return false;
    }
    static_cast<void>(start.release());
    return true;
}

VersionsDialog::VersionsDialog(Selection selection, ManifestRef manifest, bool ownThread)
    : paths_(std::move(selection.paths)), coverage_(selection.restoreMode), manifest_(std::move(manifest)),
      ownThread_(ownThread)
{
    if (paths_.size() == 1 && !selection.isFolder)
        singleFile_ = *paths_.begin();
}

VersionsDialog::~VersionsDialog()
{
    // The module lock, the first member, is released after this call, so that COM does not unmap this code.
    if (!ownThread_)
        CoFreeUnusedLibraries();
}

INT_PTR VersionsDialog::handleMessage(HWND window, UINT message, WPARAM wParam, LPARAM lParam)
{
    const auto keep = shared_from_this();
    const ActivationScope activation;
    switch (message) {
    case WM_INITDIALOG:
        window_ = window;
        initialize();
        return FALSE;
    case WM_NOTIFY: {
        const auto& change = *reinterpret_cast<const NMLISTVIEW*>(lParam);
        if (change.hdr.idFrom == TAVI_VERSIONS_LIST && change.hdr.code == LVN_ITEMCHANGED &&
            (change.uChanged & LVIF_STATE))
            enableActions((change.uNewState & LVIS_SELECTED) != 0);
        return FALSE;
    }
    case WM_COMMAND:
        runCommand(LOWORD(wParam));
        return TRUE;
    case WM_CLOSE:
        // The property sheet destroys the window of its page.
        if (ownThread_)
            DestroyWindow(window);
        return TRUE;
    case WM_DESTROY:
        if (ownThread_)
            PostQuitMessage(0);
        return TRUE;
    default:
        return FALSE;
    }
}

HWND VersionsDialog::list() const
{
    return GetDlgItem(window_, TAVI_VERSIONS_LIST);
}

void VersionsDialog::initialize()
{
    setTexts();
    if (ownThread_)
        setWindowIcons(window_);
    SendMessageW(list(), LVM_SETEXTENDEDLISTVIEWSTYLE, 0, LVS_EX_FULLROWSELECT | LVS_EX_DOUBLEBUFFER);
    addColumns();
    addRows();
    SendMessageW(window_, DM_SETDEFID, TAVI_VERSIONS_RESTORE, 0);
}

void VersionsDialog::setTexts()
{
    if (ownThread_)
        SetWindowTextW(window_, _("Restore Files").wc_str());
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
}

wxString VersionsDialog::fitName(const wxString& text, const wxString& name) const
{
    const HWND control = GetDlgItem(window_, TAVI_VERSIONS_MESSAGE);
    RECT room{};
    GetClientRect(control, &room);
    const ScreenDc dc(GetDC(nullptr));
    const auto font = reinterpret_cast<HGDIOBJ>(SendMessageW(control, WM_GETFONT, 0, 0));
    const HGDIOBJ previous = font ? SelectObject(dc.get(), font) : nullptr;
    const ScopeGuard deselect([&] {
        if (previous)
            SelectObject(dc.get(), previous);
    });
    const auto fits = [&](std::size_t kept) {
        const wxString whole = withName(text, shortenMiddle(name, kept));
        RECT needed = room;
        DrawTextW(dc.get(), whole.wc_str(), -1, &needed, DT_CALCRECT | DT_WORDBREAK | DT_NOPREFIX);
        return needed.right <= room.right && needed.bottom <= room.bottom;
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

void VersionsDialog::runCommand(UINT id)
{
    const bool closes = id == IDCANCEL || id == TAVI_VERSIONS_RESTORE || id == TAVI_VERSIONS_COPY_TO;
    // The user cannot give a second command while a box of the first is open; another program can.
    if (!closes || busy_)
        return;
    {
        busy_ = true;
        const ScopeGuard done([&] { busy_ = false; });
        guarded("versions dialog command", [&] {
            if (id == TAVI_VERSIONS_RESTORE)
                restoreInPlace();
            else if (id == TAVI_VERSIONS_COPY_TO)
                isSingleFile() ? copyFile() : copyToFolder();
        });
    }
    // The window closes whatever the answer was. It may be destroyed already, while the box was open.
    if (!IsWindow(window_))
        return;
    if (ownThread_)
        DestroyWindow(window_);
    else if (id == IDCANCEL)
        PostMessageW(GetParent(window_), PSM_PRESSBUTTON, PSBTN_CANCEL, 0);
}

std::optional<bool> VersionsDialog::askOverwrite(const wxString& question, UINT icon) const
{
    const int answer = MessageBoxW(window_, question.wc_str(), _("Tavi Remote Backup").wc_str(), MB_YESNOCANCEL | icon);
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
    // A window of our own closes after the request; a page stays and may ask again.
    if (ownThread_)
        request.selectedPaths = std::move(paths_);
    else
        request.selectedPaths = paths_;
    request.cutoffTime = *time;
    request.sourcePrefix = sourcePrefix;
    request.destinationFolder = destination;
    request.overwrite = overwrite;
    SetCursor(LoadCursorW(nullptr, IDC_WAIT));
    performRestore(request, *manifest_);
    RestoreProgressWindow::getOrCreate();
}

} // namespace tavi
