#pragma once

#include <windows.h>

namespace tavi {

// A function of a loaded library by name; null when it has none of that name.
template <class Function>
void findFunction(HMODULE library, const char* name, Function& function) noexcept
{
    function = reinterpret_cast<Function>(reinterpret_cast<void*>(GetProcAddress(library, name)));
}

} // namespace tavi
