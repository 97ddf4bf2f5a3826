#pragma once

#include <windows.h>
#include <unknwn.h>

#include "core/RefCounted.h"

namespace tavi {

// Returns a new factory of one of the module's classes, or null for a class that the module lacks. Throws
// std::bad_alloc.
RefPtr<IClassFactory> makeClassFactory(REFCLSID classId);

} // namespace tavi
