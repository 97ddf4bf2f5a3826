#pragma once

#include <windows.h>
#include <unknwn.h>

namespace tavi {

// A factory of one of the module's classes with one reference for the caller, or null for a class that the module
// lacks. Throws std::bad_alloc.
IClassFactory* makeClassFactory(REFCLSID classId);

} // namespace tavi
