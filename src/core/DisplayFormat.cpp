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

// In this order: the third row restores what the second one damages in the result of the first.
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
    const auto split = [&](std::uint32_t unit) {
        if (seconds <= unit)
            return 0ul;
        const std::uint32_t count = seconds / unit;
        seconds %= unit;
        return static_cast<unsigned long>(count);
    };
    const unsigned long days = split(86400);
    const unsigned long hours = split(3600);
    const unsigned long minutes = split(60);
    const unsigned long rest = seconds;

    const auto phrase = [&](int unit) {
        switch (unit) {
        case 0:
            return wxString::Format(wxPLURAL("%lu day", "%lu days", static_cast<unsigned>(days)), days);
        case 1:
            return wxString::Format(wxPLURAL("%lu hour", "%lu hours", static_cast<unsigned>(hours)), hours);
        case 2:
            return wxString::Format(wxPLURAL("%lu minute", "%lu minutes", static_cast<unsigned>(minutes)), minutes);
        default:
            return wxString::Format(wxPLURAL("%lu second", "%lu seconds", static_cast<unsigned>(rest)), rest);
        }
    };
    const unsigned long counts[] = {days, hours, minutes, rest};
    for (int unit = 0; unit < 3; ++unit) {
        if (counts[unit] == 0)
            continue;
        const wxString largest = phrase(unit);
        return counts[unit + 1] == 0 ? largest : largest + L", " + phrase(unit + 1);
    }
    return phrase(3);
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
