#include "ui/PropertyPage.h"

#include <algorithm>
#include <atomic>
#include <memory>
#include <utility>
#include <vector>

#include <objbase.h>
#include <wx/intl.h>

#include "core/Boundary.h"
#include "core/Handles.h"
#include "core/InitializeOnce.h"
#include "core/LogLine.h"
#include "core/Module.h"
#include "core/Utf8.h"
#include "ui/ActivationScope.h"
#include "ui/DialogLayout.h"
#include "ui/resource.h"
#include "ui/VersionsDialog.h"

namespace tavi {
namespace {

// Counts as an object of the module.
struct Page {
    Page(const Selection& selection, ManifestRef manifest) : dialog(selection, std::move(manifest)), title(_("Tavi")) {}
    ~Page()
    {
        // The lock, the first member, is released after this call, so that COM does not unmap this code.
        CoFreeUnusedLibraries();
    }
    const ModuleLock lock;
    VersionsDialog dialog;
    const wxString title;
    // The sheet's until it has created the page.
    std::vector<std::uint32_t> layout = dialogTemplate(TAVI_DIALOG_VERSIONS);
};
// The page description owns a reference until the sheet releases the page, shown or not. Each frame of the page's
// procedure has another: the sheet may be destroyed in the message loop of a box that the frame has opened.
using PageReference = std::shared_ptr<Page>;

INT_PTR CALLBACK pageProcedure(HWND window, UINT message, WPARAM wParam, LPARAM lParam)
{
    return guarded("property page", INT_PTR{0}, [&]() -> INT_PTR {
        if (message == WM_INITDIALOG)
            SetWindowLongPtrW(window, GWLP_USERDATA, reinterpret_cast<const PROPSHEETPAGEW*>(lParam)->lParam);
        const auto* const owned = reinterpret_cast<const PageReference*>(GetWindowLongPtrW(window, GWLP_USERDATA));
        if (!owned)
            return 0;
        const PageReference page = *owned;
        switch (message) {
        case WM_COMMAND:
            // Only Cancel closes the sheet, which belongs to the host.
            if (page->dialog.runCommand(LOWORD(wParam)) && LOWORD(wParam) == IDCANCEL)
                PostMessageW(GetParent(window), PSM_PRESSBUTTON, PSBTN_CANCEL, 0);
            return TRUE;
        case WM_CLOSE:
            // The dialog manager would make it Cancel.
            return TRUE;
        default:
            page->dialog.handleMessage(window, message, lParam);
            return FALSE;
        }
    });
}

UINT CALLBACK pageCallback(HWND, UINT message, PROPSHEETPAGEW* description)
{
    return guarded("property page release", UINT{1}, [&] {
        if (message == PSPCB_RELEASE)
            delete reinterpret_cast<const PageReference*>(std::exchange(description->lParam, 0));
        return UINT{1};
    });
}

// Returns the common controls that the module's manifest names; called inside an activation scope. Loaded once and
// kept, since a page may outlive the object that added it.
HMODULE sheetControls() noexcept
{
    static std::atomic<HMODULE> controls{nullptr};
    return initializeOnce(controls, [] { return LibraryHandle(LoadLibraryW(L"comctl32.dll")); });
}

template <class Function>
Function sheetFunction(const char* name) noexcept
{
    Function function = nullptr;
    if (const HMODULE controls = sheetControls())
        findFunction(controls, name, function);
    return function;
}

} // namespace

void addPropertyPage(const Selection& selection, ManifestRef manifest, LPFNADDPROPSHEETPAGE addPage, LPARAM parameter)
{
    const bool isOffered = addPage && manifest &&
                           std::any_of(selection.paths.begin(), selection.paths.end(),
                                       [&](const wxString& path) { return manifest->isBackedUp(view(path), 0); });
    if (!isOffered)
        return;
    const ActivationScope activation;
    auto page = std::make_unique<PageReference>(std::make_shared<Page>(selection, std::move(manifest)));
    PROPSHEETPAGEW description{};
    description.dwSize = sizeof(description);
    description.dwFlags = PSP_DLGINDIRECT | PSP_USETITLE | PSP_USEREFPARENT | PSP_USECALLBACK;
    description.hInstance = moduleInstance();
    description.pResource = reinterpret_cast<LPCDLGTEMPLATEW>((*page)->layout.data());
    description.pszTitle = (*page)->title.wc_str();
    description.pfnDlgProc = pageProcedure;
    description.lParam = reinterpret_cast<LPARAM>(page.get());
    description.pfnCallback = pageCallback;
    static_assert(sizeof(moduleRefCount()) == sizeof(UINT), "the system counts in the module's own count");
    description.pcRefParent = reinterpret_cast<UINT*>(&moduleRefCount());
    const auto create = sheetFunction<decltype(&CreatePropertySheetPageW)>("CreatePropertySheetPageW");
    const HPROPSHEETPAGE handle = create ? create(&description) : nullptr;
    if (!handle) {
        logError(L"Unable to create the property page (%lu)", GetLastError());
        return;
    }
    // The page's callback frees it.
    static_cast<void>(page.release());
    if (addPage(handle, parameter))
        return;
    if (const auto destroy = sheetFunction<decltype(&DestroyPropertySheetPage)>("DestroyPropertySheetPage"))
        destroy(handle);
}

} // namespace tavi
