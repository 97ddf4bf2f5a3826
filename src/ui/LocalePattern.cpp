#include "ui/LocalePattern.h"

#include <vector>

#include <windows.h>

#include "core/DisplayFormat.h"

namespace tavi {
namespace {

wxString localeText(LCTYPE type)
{
    const int length = GetLocaleInfoW(LOCALE_USER_DEFAULT, type, nullptr, 0);
    if (length <= 0)
        return wxString();
    std::vector<wchar_t> buffer(static_cast<std::size_t>(length));
    if (!GetLocaleInfoW(LOCALE_USER_DEFAULT, type, buffer.data(), length))
        return wxString();
    return wxString(buffer.data());
}

} // namespace

wxString localeDateTimePattern()
{
    return dateTimePattern(localeText(LOCALE_STIMEFORMAT), localeText(LOCALE_STIME), localeText(LOCALE_SSHORTDATE));
}

} // namespace tavi
