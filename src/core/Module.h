#pragma once

#include <atomic>
#include <cstdint>

#include <windows.h>

namespace tavi {

// The module's own instance, set at attach before any other use and never changed. Resources and the module path come
// from it.
HINSTANCE moduleInstance() noexcept;
void setModuleInstance(HINSTANCE instance) noexcept;

// Live COM objects, class factories and windows. The host may unload the module while it is 0.
std::atomic<std::int32_t>& moduleRefCount() noexcept;

// Counts as one object of the module for as long as it lives. Any thread.
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
