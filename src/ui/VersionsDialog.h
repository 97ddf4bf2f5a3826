#pragma once

#include <cstdint>
#include <memory>
#include <optional>

#include <windows.h>
#include <wx/string.h>

#include "core/Module.h"
#include "manifest/Manifest.h"
#include "ui/Selection.h"

namespace tavi {

struct RestoreRequest;

// Opens the "Restore Files" window for the selection, with a thread of its own, on the monitor of the host's window
// (which may be null). Any thread; any number of windows. Returns false and logs an error if the thread cannot start.
bool startVersionsDialog(Selection selection, ManifestRef manifest, HWND host);

// The behaviour of the versions dialog, in a window of its own or as a page of a property sheet. Used only by the
// window's thread. Counts as an object of the module.
//
// Held by shared pointers: the boxes that it opens run message loops, in which the window and the sheet's reference may
// be destroyed while frames below still use the object.
class VersionsDialog : public std::enable_shared_from_this<VersionsDialog> {
  public:
    // With `ownThread` the destruction of the window ends the thread's message loop. Without it the window is a page,
    // after which COM may unload libraries that nobody uses any more.
    VersionsDialog(Selection selection, ManifestRef manifest, bool ownThread);
    VersionsDialog(const VersionsDialog&) = delete;
    VersionsDialog& operator=(const VersionsDialog&) = delete;
    ~VersionsDialog();

    // Handles a message and returns a dialog procedure's result. The first message must be WM_INITDIALOG.
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
    // Asks whether existing files may be overwritten. Returns nothing when the user cancels.
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
    Coverage coverage_;
    ManifestRef manifest_;
    bool ownThread_;
    bool busy_ = false;
};

} // namespace tavi
