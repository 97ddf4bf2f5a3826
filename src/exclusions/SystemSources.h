#pragma once

#include "exclusions/ExclusionRules.h"
#include "exclusions/FolderListings.h"

namespace tavi {

// Returns the sources of this machine. Only users whose hives are loaded have folders (see UserProfiles.h). The
// listings must outlive the sources. One thread.
ExclusionSources systemSources(FolderListings& listings);

} // namespace tavi
