#pragma once

#include <string>
#include <vector>

#include "services/kovanotifyd/notifier.h"

namespace ferrox::notifyd {

/// Fills in the ways in which folders can be watched here, the best first, each with its watcher and its cookie below
/// the instance's state folder. `allowed` has the names of those that the settings allow, in any order: "fanotify",
/// "fanotify inode marks", "inotify" and "periodic scan". Other names are added to the problems.
void ChooseWays(const std::vector<std::string>& allowed, Notifier::Options& options);

/// Beginnings of the paths of the files that belong to this instance's daemons (Notifier::Options::own_paths).
std::vector<std::string> OwnPaths();

}  // namespace ferrox::notifyd
