#pragma once

#include <functional>
#include <string>
#include <vector>

#include "services/kovanotifyd/registry.h"
#include "services/kovanotifyd/watcher.h"

namespace ferrox::notifyd {

/// Whether whoever watches `outer`, and leaves out what it ignores there, sees all of `inner`, when both are on one
/// mount.
bool Covers(const WatchRoot& outer, const WatchRoot& inner);

/// The folders to watch for what is registered, in ascending order of their paths: each watched folder once, without
/// those that another one covers as far as `same_mount` says that nothing is mounted between them.
std::vector<WatchRoot> WatchRoots(
    const std::vector<Registration>& registrations,
    const std::function<bool(const std::string& outer, const std::string& inner)>& same_mount);

}  // namespace ferrox::notifyd
