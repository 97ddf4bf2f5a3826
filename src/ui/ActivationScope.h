#pragma once

#include <windows.h>

namespace tavi {

// Activates the module's own manifest on the calling thread, so that windows, common dialogs and message boxes created
// in the scope use version 6 of the common controls whatever the host uses. Scopes nest.
class ActivationScope {
  public:
    ActivationScope() noexcept;
    ~ActivationScope();
    ActivationScope(const ActivationScope&) = delete;
    ActivationScope& operator=(const ActivationScope&) = delete;

  private:
    ULONG_PTR cookie_ = 0;
    bool active_ = false;
};

} // namespace tavi
