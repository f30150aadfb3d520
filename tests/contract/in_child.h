#pragma once

#include <functional>

namespace ferrox::test {

/// Runs `body` in a process of its own and expects it to have no failures. With `privately`, in namespaces of its own,
/// as root there, so that it may mount. False when this system does not let it. The test must have no other thread: one
/// that holds a lock of the allocator at that moment would leave it locked in the child for good.
bool InChild(bool privately, const std::function<void()>& body);

}  // namespace ferrox::test
