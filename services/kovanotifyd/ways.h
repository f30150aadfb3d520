#pragma once

#include <string>
#include <vector>

#include "services/kovanotifyd/notifier.h"

namespace ferrox::notifyd {

/// Fills in by which ways folders may be watched, each with its cookie below the instance's state folder. `allowed`
/// names them, in any order: "fanotify", "fanotify inode marks", "inotify" and "periodic scan". A name that is none of
/// these becomes a problem.
void ChooseWays(const std::vector<std::string>& allowed, Notifier::Options& options);

/// Where the files of this instance's daemons lie, and the beginnings of their names.
std::vector<std::string> OwnPaths();

}  // namespace ferrox::notifyd
