#pragma once

#include <wx/string.h>

namespace tavi {

// Returns the wxDateTime pattern of the user's short date and time without seconds. Each call reads the settings; any
// thread.
wxString localeDateTimePattern();

} // namespace tavi
