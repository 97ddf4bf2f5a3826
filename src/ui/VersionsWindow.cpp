#include "ui/VersionsWindow.h"

#include <memory>
#include <utility>

#include <ole2.h>
#include <wx/intl.h>

#include "core/Boundary.h"
#include "core/Handles.h"
#include "core/LogLine.h"
#include "core/Module.h"
#include "core/ModuleThread.h"
#include "ui/ActivationScope.h"
#include "ui/DialogLayout.h"
#include "ui/resource.h"
#include "ui/VersionsDialog.h"
#include "ui/WindowFrame.h"

namespace tavi {
namespace {

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

INT_PTR CALLBACK windowProcedure(HWND window, UINT message, WPARAM wParam, LPARAM lParam)
{
    return guarded("versions window", INT_PTR{FALSE}, [&]() -> INT_PTR {
        auto* const dialog = dialogObject<VersionsDialog>(window, message, lParam);
        if (!dialog)
            return FALSE;
        switch (message) {
        case WM_INITDIALOG:
            // First: without its window the dialog would ignore Cancel.
            dialog->handleMessage(window, message, lParam);
            SetWindowTextW(window, _("Restore Files").wc_str());
            setWindowIcons(window);
            return FALSE;
        case WM_COMMAND:
            if (dialog->runCommand(LOWORD(wParam)))
                DestroyWindow(window);
            return TRUE;
        case WM_CLOSE:
            DestroyWindow(window);
            return TRUE;
        case WM_DESTROY:
            PostQuitMessage(0);
            return TRUE;
        default:
            break;
        }
        dialog->handleMessage(window, message, lParam);
        return FALSE;
    });
}

// The argument of a window's thread. Counts as an object of the module until the thread's last step.
struct WindowStart {
    ModuleLock lock;
    Selection selection;
    ManifestRef manifest;
    HWND host;
};

void runVersionsWindow(void* argument)
{
    const std::unique_ptr<WindowStart> start(static_cast<WindowStart*>(argument));
    const OleScope ole;
    const ActivationScope activation;
    VersionsDialog dialog(std::move(start->selection), std::move(start->manifest));
    const auto layout = dialogTemplate(TAVI_DIALOG_VERSIONS);
    // No owner: Windows would join the input queues of this thread and the owner's.
    const WindowHandle window(CreateDialogIndirectParamW(moduleInstance(),
                                                         reinterpret_cast<LPCDLGTEMPLATEW>(layout.data()), nullptr,
                                                         windowProcedure, reinterpret_cast<LPARAM>(&dialog)));
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

bool openVersionsWindow(Selection selection, ManifestRef manifest, HWND host)
{
    std::unique_ptr<WindowStart> start(new WindowStart{{}, std::move(selection), std::move(manifest), host});
    if (!KernelHandle(startModuleThread(runVersionsWindow, start.get()))) {
        logError(L"Unable to start the versions dialog");
        return false;
    }
    static_cast<void>(start.release());
    return true;
}

} // namespace tavi
