#pragma once

#include <cstdint>
#include <optional>

#include <windows.h>
#include <wx/string.h>

#include "manifest/Manifest.h"
#include "ui/Selection.h"

namespace tavi {

// The content of the versions dialog, whose host is a window of its own (VersionsWindow) or a page of a property sheet
// (PropertyPage). Used only by the window's thread.
//
// The boxes that it opens run message loops, in which the window may be destroyed: the host keeps the object until the
// last call has returned.
class VersionsDialog {
  public:
    VersionsDialog(Selection selection, ManifestRef manifest);
    VersionsDialog(const VersionsDialog&) = delete;
    VersionsDialog& operator=(const VersionsDialog&) = delete;

    // Handles a message of the window, for which the dialog procedure returns FALSE. The first must be WM_INITDIALOG.
    void handleMessage(HWND window, UINT message, LPARAM lParam);
    // Runs the command of a button. Returns true if the window is to close then, whatever the user answered: false for
    // another command, during a command, and if the window no longer exists.
    bool runCommand(UINT id);

  private:
    void initialize();
    void setTexts();
    void addColumns();
    void addRows();
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

    HWND window_ = nullptr;
    PathSet paths_;
    wxString singleFile_;
    Coverage coverage_;
    ManifestRef manifest_;
    bool isBusy_ = false;
};

} // namespace tavi
