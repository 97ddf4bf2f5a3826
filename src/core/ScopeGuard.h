#pragma once

#include <utility>

namespace tavi {

// Runs a function, which must not throw, at the end of the scope.
template <class Function>
class ScopeGuard {
  public:
    explicit ScopeGuard(Function function) noexcept : function_(std::move(function)) {}
    ScopeGuard(const ScopeGuard&) = delete;
    ScopeGuard& operator=(const ScopeGuard&) = delete;
    ~ScopeGuard()
    {
        function_();
    }

  private:
    Function function_;
};

} // namespace tavi
