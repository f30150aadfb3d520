#pragma once

#include <functional>

namespace ferrox::test {

/// Runs `body` in a process of its own and expects it to have no failures. With `privately`, in namespaces of its own,
/// as root there, so that it may mount. False when this system does not let it.
bool InChild(bool privately, const std::function<void()>& body);

}  // namespace ferrox::test
