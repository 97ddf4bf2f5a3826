#pragma once

#include <atomic>
#include <cstdint>

#include <windows.h>

namespace tavi {

// The module's own instance, for its resources and its path. Set once, at attach, before any other use.
HINSTANCE moduleInstance() noexcept;
void setModuleInstance(HINSTANCE instance) noexcept;

// The number of COM objects, class factories and windows. While it is 0 the host may unload the module.
std::atomic<std::int32_t>& moduleRefCount() noexcept;

// Counts as one object of the module during its lifetime. Any thread.
class ModuleLock {
  public:
    ModuleLock() noexcept
    {
        ++moduleRefCount();
    }
    ~ModuleLock()
    {
        --moduleRefCount();
    }
    ModuleLock(const ModuleLock&) = delete;
    ModuleLock& operator=(const ModuleLock&) = delete;
};

} // namespace tavi
