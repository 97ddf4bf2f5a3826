#pragma once

#include <cstdint>

#include <wx/string.h>

// Display texts of numbers. Pure functions; words come from the active message catalogue. Any thread.
namespace tavi {

// A byte count. A value equal to a unit's threshold stays in the smaller unit.
wxString formatSize(std::int64_t bytes);

// An amount per second, in the lower-case bit units: the caller passes bits.
wxString formatRate(std::uint64_t amountPerSecond);

// A number of seconds, as its largest unit and the next smaller one.
wxString formatDuration(std::uint32_t seconds);

// The wxDateTime pattern of a locale's pictures: the short date, one blank, the time without its seconds.
wxString dateTimePattern(wxString timePicture, const wxString& timeSeparator, wxString datePicture);

} // namespace tavi
