#include "core/LogLine.h"

#include <cstdarg>
#include <cstddef>
#include <cwchar>

#include <wx/log.h>
#include <wx/time.h>

namespace tavi {
namespace {

constexpr std::size_t kTextChars = 4096;

void logText(wxLogLevel level, const wchar_t* format, std::va_list arguments) noexcept
{
    if (!wxLog::IsEnabled() || level > wxLog::GetLogLevel())
        return;
    wchar_t text[kTextChars] = L"";
    // A C library may leave out the terminator of a text that it cuts.
    std::vswprintf(text, kTextChars, format, arguments);
    text[kTextChars - 1] = L'\0';
    try {
        wxLogRecordInfo info(nullptr, 0, nullptr, wxLOG_COMPONENT);
        info.timestampMS = wxGetUTCTimeMillis().GetValue();
        wxLog::OnLog(level, text, info);
    } catch (...) {
    }
}

} // namespace

void logError(const wchar_t* format, ...) noexcept
{
    std::va_list arguments;
    va_start(arguments, format);
    logText(wxLOG_Error, format, arguments);
    va_end(arguments);
}

void logWarning(const wchar_t* format, ...) noexcept
{
    std::va_list arguments;
    va_start(arguments, format);
    logText(wxLOG_Warning, format, arguments);
    va_end(arguments);
}

void logInfo(const wchar_t* format, ...) noexcept
{
    std::va_list arguments;
    va_start(arguments, format);
    logText(wxLOG_Info, format, arguments);
    va_end(arguments);
}

} // namespace tavi
