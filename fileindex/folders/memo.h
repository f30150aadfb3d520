#pragma once

#include <exception>
#include <memory>
#include <utility>

#include "common/error.h"

namespace ferrox::fileindex {

/// Something that is made when it is first needed, and then kept. When making it throws an Error, that is kept instead
/// and thrown again at every later request, with its type, and nothing is tried again. For one thread.
template <typename T>
class Memo {
 public:
  /// What is kept, else what `make` returns, a std::unique_ptr. @throws Error as `make` did.
  template <typename Make>
  T& Get(const Make& make) {
    if (failure_) std::rethrow_exception(failure_);  // logged when it arose
    try {
      if (value_ == nullptr) value_ = make();
    } catch (const Error&) {
      failure_ = std::current_exception();
      throw;
    }
    return *value_;
  }

 private:
  // At most one of the two is set.
  std::unique_ptr<T> value_;
  std::exception_ptr failure_;
};

}  // namespace ferrox::fileindex
