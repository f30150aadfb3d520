#pragma once

#include <optional>
#include <string>
#include <vector>

#include "cli/access_rule.h"
#include "cli/as_user.h"

namespace ferrox::cli {

/// What a user needs of one file or folder on the way to a file, and whether it is granted.
struct AccessStep {
  std::string path;
  Wanted wanted = Wanted::kEnter;
  std::string access;  ///< the rights that it has now (DecideAccess)
  AccessDecision decision;
};

/// The way from "/" to a file, by the rights that all on it have now.
struct AccessWay {
  std::vector<AccessStep> steps;     ///< up to the first that is not granted
  std::optional<bool> kernel_opens;  ///< what a process of the user met; nothing where none could be made
  bool Granted() const { return !steps.empty() && steps.back().decision.granted; }
};

/// Follows the way to `path`. Only root can have the kernel asked, too. A link below `root`, the share's folder, ends
/// the way: links are not indexed.
AccessWay FollowAccess(const std::string& path, const std::string& root, const AskedUser& user);

/// Why a user is not shown the file at `path`, a full path in the share, and the way to it: on standard output, as one
/// JSON object or for people.
/// @throws as AskEngine does.
void PrintWhyNotShown(const std::string& path, const std::string& share, const AskedUser& user, bool json);

}  // namespace ferrox::cli
