#pragma once

#include <utility>

namespace base {

/// Calls a function when the scope ends, by an exception too. For what must be given back and has no class of its own:
///   const base::ScopeExit remove([&] { (void)unlink(path.c_str()); });
/// The function must not throw, since that would end the process, and what it refers to must outlive this object. It is
/// called exactly once, and always; what is to be left out on success asks a flag that it refers to. Several objects in
/// one scope are called in reverse order. The result of a return statement is computed before the call. errno is not
/// kept: a function that may change it saves it where the caller reads it afterwards.
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
