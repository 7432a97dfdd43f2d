// Cleans up at the end of a scope, also when an exception leaves it.
//
//     handle = Begin();
//     ScopeGuard undo([&] { Abandon(handle); });
//     Work(handle);    // may throw
//     undo.Dismiss();
#ifndef ORVADRCORE_SRC_BASE_SCOPE_GUARD_H
#define ORVADRCORE_SRC_BASE_SCOPE_GUARD_H

#include <utility>

namespace OrvaDRCore {

// Calls a function at the end of the scope, unless dismissed. The function must not throw.
template <class Function>
class ScopeGuard {
  public:
    explicit ScopeGuard(Function function) : function_(std::move(function)) {}
    ScopeGuard(const ScopeGuard&) = delete;
    ScopeGuard& operator=(const ScopeGuard&) = delete;
    ~ScopeGuard()
    {
        if (isActive_) function_();
    }

    void Dismiss() { isActive_ = false; }

  private:
    Function function_;
    bool isActive_ = true;
};

}  // namespace OrvaDRCore

#endif
