#include "core/Options.h"

#include <wx/datetime.h>

#include "core/InstallPaths.h"
#include "core/Registry.h"

namespace tavi {
namespace {

constexpr const wchar_t* kManifestTime = L"options.manifestmtime";
constexpr const wchar_t* kGraylist = L"options.graylist";

// Deletes a value that cannot be read: the service writes a new one when it finds none.
void deleteOption(const wchar_t* name) noexcept
{
    if (const RegistryKey settings = openSettingsKey(KEY_SET_VALUE))
        RegDeleteValueW(settings.get(), name);
}

} // namespace

std::optional<std::int64_t> readManifestTime()
{
    const RegistryKey settings = openSettingsKey(KEY_READ);
    if (!settings)
        return std::nullopt;
    wxString text;
    if (queryRegistryText(settings.get(), kManifestTime, text) != ERROR_SUCCESS) {
        deleteOption(kManifestTime);
        return std::nullopt;
    }
    wxDateTime time;
    wxString::const_iterator end;
    // The service's own form first: to look for words such as "today", ParseDateTime translates them, in tables of
    // wxWidgets that end the host without memory.
    if ((!time.ParseISOCombined(text, L' ') && !time.ParseDateTime(text, &end)) || !time.IsValid())
        return std::nullopt;
    return time.GetValue().GetValue();
}

std::optional<bool> readGraylistEnabled()
{
    const RegistryKey settings = openSettingsKey(KEY_READ);
    if (!settings)
        return std::nullopt;
    DWORD number = 0;
    DWORD bytes = sizeof(number);
    if (RegGetValueW(settings.get(), nullptr, kGraylist, RRF_RT_REG_DWORD, nullptr, &number, &bytes) != ERROR_SUCCESS) {
        deleteOption(kGraylist);
        return std::nullopt;
    }
    return number != 0;
}

} // namespace tavi
