#include "core/Options.h"

#include <windows.h>
#include <wx/datetime.h>
#include <wx/msw/registry.h>

#include "core/InstallPaths.h"
#include "core/Log.h"

namespace tavi {
namespace {

template <class Value, class Read>
std::optional<Value> readOption(const wchar_t* name, Read read)
{
    const LogSilencer silence;
    wxRegKey settings = settingsKey();
    if (!settings.Exists())
        return std::nullopt;
    // A failed read may store a part of the value.
    Value value{};
    if (read(settings, value))
        return value;
    // The service writes a new value when it finds none.
    settings.DeleteValue(name);
    return std::nullopt;
}

} // namespace

std::optional<std::int64_t> readManifestTime()
{
    constexpr const wchar_t* kName = L"options.manifestmtime";
    const auto text =
        readOption<wxString>(kName, [&](wxRegKey& key, wxString& value) { return key.QueryValue(kName, value); });
    wxDateTime time;
    wxString::const_iterator end;
    if (!text || !time.ParseDateTime(*text, &end) || !time.IsValid())
        return std::nullopt;
    return time.GetValue().GetValue();
}

std::optional<bool> readGraylistEnabled()
{
    constexpr const wchar_t* kName = L"options.graylist";
    const auto number =
        readOption<long>(kName, [&](wxRegKey& key, long& value) { return key.QueryValue(kName, &value); });
    if (!number)
        return std::nullopt;
    return *number != 0;
}

} // namespace tavi
