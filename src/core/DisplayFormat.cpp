#include "core/DisplayFormat.h"

#include <cwchar>
#include <iterator>
#include <string>

#include <wx/intl.h>
#include <wx/translation.h>

namespace tavi {
namespace {

constexpr double kKilo = 1024.0;
constexpr double kMega = kKilo * 1024.0;
constexpr double kGiga = kMega * 1024.0;

struct Replacement {
    const wchar_t* picture;
    const wchar_t* conversion;
};

// Replaced row by row, in the whole text. The single letter of a picture also matches in the conversion that an earlier
// row has put in ("%H" becomes "%%H"); the row with two percent signs repairs that.
const Replacement kTimePictures[] = {{L"HH", L"%H"}, {L"H", L"%H"},  {L"%%H", L"%H"}, {L"hh", L"%I"},
                                     {L"h", L"%I"},  {L"mm", L"%M"}, {L"m", L"%M"},   {L"ss", L"%S"},
                                     {L"s", L"%S"},  {L"tt", L"%p"}, {L"t", L"%p"}};
const Replacement kDatePictures[] = {{L"yyyy", L"%Y"}, {L"yy", L"%y"}, {L"MMMM", L"%B"}, {L"MMM", L"%b"},
                                     {L"MM", L"%m"},   {L"M", L"%m"},  {L"dddd", L"%A"}, {L"ddd", L"%a"},
                                     {L"dd", L"%d"},   {L"d", L"%d"},  {L"%%d", L"%d"}};

template <std::size_t kSize>
void replaceAll(wxString& text, const Replacement (&table)[kSize])
{
    for (const Replacement& row : table)
        text.Replace(row.picture, row.conversion);
}

// Not wxString::Format(), which ends the host when memory runs out.
wxString withOneDecimal(double value)
{
    wchar_t text[32] = L"";
    std::swprintf(text, std::size(text), L"%.1f", value);
    return wxString(text);
}

wxString withCount(wxString text, std::uint32_t count)
{
    text.Replace(L"%lu", std::to_wstring(count));
    return text;
}

wxString dayText(std::uint32_t count)
{
    return withCount(wxPLURAL("%lu day", "%lu days", count), count);
}

wxString hourText(std::uint32_t count)
{
    return withCount(wxPLURAL("%lu hour", "%lu hours", count), count);
}

wxString minuteText(std::uint32_t count)
{
    return withCount(wxPLURAL("%lu minute", "%lu minutes", count), count);
}

wxString secondText(std::uint32_t count)
{
    return withCount(wxPLURAL("%lu second", "%lu seconds", count), count);
}

} // namespace

wxString formatSize(std::int64_t bytes)
{
    const auto value = static_cast<double>(bytes);
    if (value > kGiga)
        return withOneDecimal(value / kGiga) + L" " + _("GB");
    if (value > kMega)
        return withOneDecimal(value / kMega) + L" " + _("MB");
    if (value > kKilo)
        return withOneDecimal(value / kKilo) + L" " + _("KB");
    return wxString(std::to_wstring(bytes)) + L" " + _("bytes");
}

wxString formatRate(std::uint64_t amountPerSecond)
{
    const auto value = static_cast<double>(amountPerSecond);
    if (value >= kGiga)
        return withOneDecimal(value / kGiga) + L" " + _("Gb") + L"/s";
    if (value >= kMega)
        return withOneDecimal(value / kMega) + L" " + _("Mb") + L"/s";
    if (value >= kKilo)
        return withOneDecimal(value / kKilo) + L" " + _("Kb") + L"/s";
    return withOneDecimal(value) + L" " + _("b") + L"/s";
}

wxString formatDuration(std::uint32_t seconds)
{
    // Strictly greater, as users know it: 86400 seconds read "24 hours", not "1 day".
    const auto takeUnits = [&](std::uint32_t unit) {
        const std::uint32_t count = seconds > unit ? seconds / unit : 0;
        seconds -= count * unit;
        return count;
    };
    const std::uint32_t days = takeUnits(86400);
    const std::uint32_t hours = takeUnits(3600);
    const std::uint32_t minutes = takeUnits(60);
    if (days > 0)
        return hours > 0 ? dayText(days) + L", " + hourText(hours) : dayText(days);
    if (hours > 0)
        return minutes > 0 ? hourText(hours) + L", " + minuteText(minutes) : hourText(hours);
    if (minutes > 0)
        return seconds > 0 ? minuteText(minutes) + L", " + secondText(seconds) : minuteText(minutes);
    return secondText(seconds);
}

wxString withName(wxString text, const wxString& name)
{
    const std::size_t place = text.find(L"%s");
    return place == wxString::npos ? text : text.replace(place, 2, name);
}

wxString dateTimePattern(wxString timePicture, const wxString& timeSeparator, wxString datePicture)
{
    timePicture.Replace(timeSeparator + L"ss", wxString(), false);
    replaceAll(timePicture, kTimePictures);
    replaceAll(datePicture, kDatePictures);
    return datePicture + L" " + timePicture;
}

} // namespace tavi
