#pragma once

#include <cstdint>

#include <wx/string.h>

// Display texts of numbers. Pure functions; the words come from the active message catalogue. Any thread.
namespace tavi {

// Formats a number of bytes. A value equal to a unit is shown in the smaller one, "1024 bytes".
wxString formatSize(std::int64_t bytes);

// Formats a number of bits per second.
wxString formatRate(std::uint64_t amountPerSecond);

// Formats a number of seconds by its largest unit and the next smaller one.
wxString formatDuration(std::uint32_t seconds);

// Returns the text with its first %s replaced by a name. Other percent signs, in the name or by a translator's slip,
// stay as they are.
wxString withName(wxString text, const wxString& name);

// Converts a locale's pictures to a wxDateTime pattern: short date, one blank, time without seconds.
wxString dateTimePattern(wxString timePicture, const wxString& timeSeparator, wxString datePicture);

} // namespace tavi
