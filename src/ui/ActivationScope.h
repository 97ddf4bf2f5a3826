#pragma once

#include <windows.h>

namespace tavi {

// Makes the module's own manifest the thread's activation context, so that windows, common dialogs and message boxes
// made inside it use version 6 of the common controls whatever the host uses. Nests; one thread only.
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
