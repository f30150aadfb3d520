#pragma once

#include <utility>

namespace base {

/// Calls a function when the scope ends, by an exception too. For what must be given back and has no class of its own:
///   const base::ScopeExit remove([&] { (void)unlink(path.c_str()); });
/// The function must not throw, and what it refers to must outlive this object.
template <typename Function>
class ScopeExit {
 public:
  explicit ScopeExit(Function function) : function_(std::move(function)) {}
  ScopeExit(const ScopeExit&) = delete;
  ScopeExit& operator=(const ScopeExit&) = delete;
  ~ScopeExit() { function_(); }

 private:
  Function function_;
};

}  // namespace base
