#pragma once

#include <memory>
#include <utility>

namespace ferrox {

/// Makes an object that several owners share (events, operations, nodes, folders); object and count are one allocation.
/// The arguments go to its constructor, whose exceptions pass. The last owner deletes it. Owners may be in several
/// threads, but the object is not safe for them by that; its memory is kept as long as there is a std::weak_ptr to it.
///   const std::shared_ptr<Event> event = newClass<Event>(line);
template <typename T, typename... Args>
std::shared_ptr<T> newClass(Args&&... args) {
  return std::make_shared<T>(std::forward<Args>(args)...);
}

}  // namespace ferrox
