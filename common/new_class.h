#pragma once

#include <memory>
#include <utility>

namespace ferrox {

/// Makes an object that several owners share (events, operations, nodes, folders); object and count are one allocation.
/// The arguments go to its constructor, whose exceptions pass. The last owner deletes it.
template <typename T, typename... Args>
std::shared_ptr<T> newClass(Args&&... args) {
  return std::make_shared<T>(std::forward<Args>(args)...);
}

}  // namespace ferrox
