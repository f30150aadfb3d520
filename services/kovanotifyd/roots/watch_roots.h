#pragma once

#include <functional>
#include <string>
#include <vector>

#include "services/kovanotifyd/registry.h"
#include "services/kovanotifyd/watcher.h"

namespace ferrox::notifyd {

/// Whether watching `outer`, apart from the names that it ignores, includes everything that watching `inner` does, if
/// both are on one mount.
bool Covers(const WatchRoot& outer, const WatchRoot& inner);

/// The roots for what is registered, in ascending order of their paths: each registered folder once, except those that
/// another root covers on the same mount. `same_mount` says whether nothing is mounted between two folders.
std::vector<WatchRoot> WatchRoots(
    const std::vector<Registration>& registrations,
    const std::function<bool(const std::string& outer, const std::string& inner)>& same_mount);

}  // namespace ferrox::notifyd
