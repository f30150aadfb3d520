#pragma once

#include <string>

#include "cli/as_user.h"

namespace ferrox::cli {

/// What a user may want of a file or folder, as the bits of a mode name it.
enum class Wanted : unsigned { kRead = 4, kEnter = 1 };

/// Whether it is granted, and which rule decided that: "the mode's bits for others", "the ACL's entry for group 200".
struct AccessDecision {
  bool granted = false;
  std::string rule;
};

/// Decides as the kernel does for a user without capabilities: the owner by the owner's bits alone; else by the ACL,
/// which counts while the mode's group bits, its mask, are not empty, where an entry for the user ends it and one of
/// all matching groups suffices; else by the group's bits or those for others.
/// @param access the rights as text, "_KOVAAccess" (docs/formats/engine.md). One that cannot be read grants nothing.
AccessDecision DecideAccess(const std::string& access, const AskedUser& user, Wanted wanted);

}  // namespace ferrox::cli
