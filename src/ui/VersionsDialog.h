#pragma once

#include <cstdint>
#include <memory>
#include <optional>

#include <windows.h>
#include <wx/string.h>

#include "manifest/Manifest.h"
#include "core/Module.h"
#include "ui/Selection.h"

namespace tavi {

struct RestoreRequest;

// Opens the "Restore Files" window for the selection on a thread of its own, on the monitor of the host's window (which
// may be null). Any thread; any number of windows. False, with a line in the log, if the thread could not start.
bool startVersionsDialog(Selection selection, ManifestRef manifest, HWND host);

// What makes sure that the progress window exists, called on the dialog's thread after a restore was requested. May be
// null.
using ProgressWindowOpener = void (*)();
void setProgressWindowOpener(ProgressWindowOpener opener) noexcept;

// The behaviour of dialog 102, whoever hosts the window. Used by the window's thread only; held by a shared pointer,
// because the boxes it opens run message loops in which the window and its host's hold on the object may go. Counts as
// an object of the module until the last frame that uses it has returned.
class VersionsDialog : public std::enable_shared_from_this<VersionsDialog> {
  public:
    // With `ownThread` the end of the window ends the thread's message loop; without it the window is a page of a
    // sheet, whose end lets COM free the libraries that nobody uses any more.
    VersionsDialog(Selection selection, ManifestRef manifest, bool ownThread);
    VersionsDialog(const VersionsDialog&) = delete;
    VersionsDialog& operator=(const VersionsDialog&) = delete;
    ~VersionsDialog();

    // Answers a message as a dialog procedure does. The first one must be WM_INITDIALOG.
    INT_PTR handleMessage(HWND window, UINT message, WPARAM wParam, LPARAM lParam);

  private:
    void initialize();
    void setTexts();
    void addColumns();
    void addRows();
    void runCommand(UINT id);
    void restoreInPlace();
    void copyFile();
    void copyToFolder();
    void request(const wxString& sourcePrefix, const wxString& destination, bool overwrite);
    // The answer to a question that decides whether existing files may be replaced; nothing when it was declined.
    std::optional<bool> askOverwrite(const wxString& question, UINT icon) const;
    std::optional<std::uint32_t> selectedTime() const;
    void enableActions(bool enabled) const;
    wxString fitName(const wxString& text, const wxString& name) const;
    bool isSingleFile() const
    {
        return !singleFile_.empty();
    }
    HWND list() const;

    ModuleLock lock_;
    HWND window_ = nullptr;
    PathSet paths_;
    wxString singleFile_;
    std::int32_t coverage_;
    ManifestRef manifest_;
    bool ownThread_;
    bool busy_ = false;
};

} // namespace tavi
