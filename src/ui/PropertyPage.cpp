#include "ui/PropertyPage.h"

#include <algorithm>
#include <memory>

#include <wx/intl.h>

#include "core/Boundary.h"
#include "core/Handles.h"
#include "core/LogLine.h"
#include "core/Module.h"
#include "core/Utf8.h"
#include "ui/ActivationScope.h"
#include "ui/resource.h"
#include "ui/VersionsDialog.h"

namespace tavi {
namespace {

// Owned by the page description until the sheet releases the page, shown or not. The dialog counts as an object of the
// module and may outlive the page in the message loop of a box.
struct Page {
    Page(const Selection& selection, ManifestRef manifest)
        : dialog(std::make_shared<VersionsDialog>(selection, std::move(manifest), false)), title(_("Tavi"))
    {
    }
    std::shared_ptr<VersionsDialog> dialog;
    const wxString title;
};

INT_PTR CALLBACK pageProcedure(HWND window, UINT message, WPARAM wParam, LPARAM lParam)
{
    return guarded("property page", INT_PTR{0}, [&]() -> INT_PTR {
        if (message == WM_INITDIALOG)
            SetWindowLongPtrW(window, GWLP_USERDATA, reinterpret_cast<const PROPSHEETPAGEW*>(lParam)->lParam);
        const auto* const page = reinterpret_cast<const Page*>(GetWindowLongPtrW(window, GWLP_USERDATA));
        return page ? page->dialog->handleMessage(window, message, wParam, lParam) : 0;
    });
}

UINT CALLBACK pageCallback(HWND, UINT message, PROPSHEETPAGEW* description)
{
    return guarded("property page release", UINT{1}, [&] {
        if (message == PSPCB_RELEASE)
            delete reinterpret_cast<const Page*>(std::exchange(description->lParam, 0));
        return UINT{1};
    });
}

// Finds a function of the common controls that the module's manifest names; inside an activation scope. The library is
// never freed, since a page may outlive the object that added it.
template <class Function>
Function sheetFunction(const char* name) noexcept
{
    Function function = nullptr;
    if (const HMODULE controls = LoadLibraryW(L"comctl32.dll"))
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
    auto page = std::make_unique<Page>(selection, std::move(manifest));
    PROPSHEETPAGEW description{};
    description.dwSize = sizeof(description);
    description.dwFlags = PSP_USETITLE | PSP_USEREFPARENT | PSP_USECALLBACK;
    description.hInstance = moduleInstance();
    description.pszTemplate = MAKEINTRESOURCEW(TAVI_DIALOG_VERSIONS);
    description.pszTitle = page->title.wc_str();
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
