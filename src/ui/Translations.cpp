#include "ui/Translations.h"

#include <algorithm>
#include <atomic>
#include <memory>
#include <mutex>
#include <new>

#include <windows.h>
#include <wx/defs.h>
#include <wx/fontmap.h>
#include <wx/translation.h>

#include "core/Boundary.h"
#include "core/CriticalSection.h"
#include "core/Module.h"

namespace tavi {
namespace {

constexpr const wchar_t* kDomain = L"tavi";
// wxWidgets' own name for this type of resource.
constexpr const wchar_t* kResourceType = L"MOFILE";
// The headers of this compiler declare it from Windows 7 on. An older system refuses it.
constexpr LCTYPE kReadingLayout = 0x70;
// More than a loaded catalogue occupies.
constexpr std::size_t kRoomBytes = 256 * 1024;

struct State {
    CriticalSection lock;
    std::atomic<bool> isLoaded{false};
    std::atomic<bool> isRightToLeft{false};
} state;

class ModuleLoader : public wxResourceTranslationsLoader {
  protected:
    WXHINSTANCE GetModule() const override
    {
        return moduleInstance();
    }
};

std::vector<std::wstring> userLanguages()
{
    // The second call gets the names one after the other, each with its terminator.
    ULONG count = 0, size = 0;
    GetUserPreferredUILanguages(MUI_LANGUAGE_NAME, &count, nullptr, &size);
    std::vector<wchar_t> names(size + 1);
    std::vector<std::wstring> languages;
    if (size == 0 || !GetUserPreferredUILanguages(MUI_LANGUAGE_NAME, &count, names.data(), &size))
        return languages;
    for (const wchar_t* name = names.data(); *name; name += languages.back().length() + 1)
        languages.emplace_back(name);
    return languages;
}

// Returns the language of the catalogue that suits the user best, or nothing for English. A catalogue of a language
// serves all of its regions.
std::wstring chooseLanguage(const std::vector<std::wstring>& languages)
{
    for (std::wstring language : languages) {
        for (std::size_t length = language.length(); length != std::wstring::npos; length = language.rfind(L'-')) {
            language.resize(length);
            std::wstring resource = std::wstring(kDomain) + L"_" + language;
            std::replace(resource.begin(), resource.end(), L'-', L'_');
            if (language == L"en")
                return {};
            if (FindResourceW(moduleInstance(), resource.c_str(), kResourceType))
                return language;
        }
    }
    return {};
}

void load(const std::wstring& language)
{
    // wxWidgets writes to a null buffer if memory runs out while it converts a text. Here the lack is an exception.
    ::operator delete(::operator new(kRoomBytes));
    auto translations = std::make_unique<wxTranslations>();
    translations->SetLoader(new ModuleLoader);
    wxString name = language;
    name.Replace(L"-", L"_");
    translations->SetLanguage(name);
    // wxWidgets looks up the name of a known language in a table that it would create here and never free.
    if (!translations->AddCatalog(kDomain, wxLANGUAGE_UNKNOWN))
        return;
    DWORD layout = 0;
    GetLocaleInfoEx(language.c_str(), kReadingLayout | LOCALE_RETURN_NUMBER, reinterpret_cast<wchar_t*>(&layout),
                    sizeof(layout) / sizeof(wchar_t));
    state.isRightToLeft = layout == 1;
    // Last: a thread that logs an error of wxWidgets reads the pointer without the lock.
    wxTranslations::Set(translations.release());
}

} // namespace

void loadTranslations(const std::vector<std::wstring>& languages)
{
    const std::lock_guard hold(state.lock);
    if (state.isLoaded)
        return;
    if (const std::wstring language = chooseLanguage(languages); !language.empty())
        load(language);
    state.isLoaded = true;
}

void loadTranslations() noexcept
{
    if (!state.isLoaded)
        guarded("translations", [] { loadTranslations(userLanguages()); });
}

bool isTranslated() noexcept
{
    return wxTranslations::Get() != nullptr;
}

bool isRightToLeft() noexcept
{
    return state.isRightToLeft;
}

void freeTranslations() noexcept
{
    wxTranslations::Set(nullptr);
    // Created while the catalogue was read.
    wxFontMapperBase::Reset();
    state.isRightToLeft = false;
    state.isLoaded = false;
}

} // namespace tavi
