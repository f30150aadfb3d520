#pragma once

#include <memory>
#include <utility>

namespace ferrox {

/// Makes an object that is shared by design; forwards the arguments to its constructor.
template <typename T, typename... Args>
std::shared_ptr<T> newClass(Args&&... args) {
  return std::make_shared<T>(std::forward<Args>(args)...);
}

}  // namespace ferrox
