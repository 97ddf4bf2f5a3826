#pragma once

#include <wx/string.h>

namespace tavi {

// The pattern, in the date-time class's %-conversions, of the user's short date and time without seconds. Read afresh
// at each call; any thread.
wxString localeDateTimePattern();

} // namespace tavi
