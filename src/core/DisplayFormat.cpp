#include "core/DisplayFormat.h"

#include <cmath>

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

wxString dayText(unsigned long count)
{
    return wxString::Format(wxPLURAL("%lu day", "%lu days", count), count);
}

wxString hourText(unsigned long count)
{
    return wxString::Format(wxPLURAL("%lu hour", "%lu hours", count), count);
}

wxString minuteText(unsigned long count)
{
    return wxString::Format(wxPLURAL("%lu minute", "%lu minutes", count), count);
}

wxString secondText(unsigned long count)
{
    return wxString::Format(wxPLURAL("%lu second", "%lu seconds", count), count);
}

} // namespace

wxString formatSize(std::int64_t bytes)
{
    const auto value = static_cast<double>(bytes);
    if (value > kGiga)
        return wxString::Format(L"%.1f %s", value / kGiga, _("GB"));
    if (value > kMega)
        return wxString::Format(L"%.1f %s", value / kMega, _("MB"));
    if (value > kKilo)
        return wxString::Format(L"%.1f %s", value / kKilo, _("KB"));
    return wxString::Format("%" wxLongLongFmtSpec "d %s", static_cast<wxLongLong_t>(bytes), _("bytes"));
}

wxString formatRate(std::uint64_t amountPerSecond)
{
    const auto value = static_cast<double>(amountPerSecond);
    if (value >= kGiga)
        return wxString::Format(L"%.1f %s/s", value / kGiga, _("Gb"));
    if (value >= kMega)
        return wxString::Format(L"%.1f %s/s", value / kMega, _("Mb"));
    if (value >= kKilo)
        return wxString::Format(L"%.1f %s/s", value / kKilo, _("Kb"));
    return wxString::Format(L"%.1f %s/s", value, _("b"));
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
