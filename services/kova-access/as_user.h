#pragma once

#include <sys/types.h>

#include <functional>
#include <vector>

namespace ferrox::access {

/// Whose rights are tried: a uid and all of its groups, at least one.
struct User {
  uid_t uid;
  std::vector<gid_t> groups;
};

/// Runs `work` in a thread of its own that has the user's ids and groups for everything that file systems ask, and no
/// capability; the other threads keep theirs. The thread ends with the work, so nothing has to be given back. Blocks
/// until then. An exception of the work is the caller's.
/// Needs CAP_SETUID and CAP_SETGID.
/// @throws Error kEngineRightsUnknown, without having begun the work, when a step fails or does not have its effect.
void RunAsUser(const User& user, const std::function<void()>& work);

}  // namespace ferrox::access
