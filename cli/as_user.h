#pragma once

#include <sys/types.h>

#include <string>
#include <vector>

#include <json/value.h>

#include "cli/command.h"

namespace ferrox::cli {

/// The user of "--as": for whom root asks what that user would find.
struct AskedUser {
  std::string name;  ///< as people write it; the number where there is no account
  uid_t uid = 0;
  std::vector<gid_t> groups;  ///< all, the main one first
};

/// From a name, or a number of an account; or, where there is no account, a number and its groups' numbers,
/// "5001:100,200".
/// @throws UsageError where it is none of these; Failure when the accounts cannot be asked.
AskedUser ReadAskedUser(const std::string& text);

/// What the engine takes as "as".
Json::Value ToJson(const AskedUser& user);

/// The user of "--as". @throws NotPermitted when an ordinary user calls; as ReadAskedUser.
AskedUser UserOf(const Arguments& arguments);

}  // namespace ferrox::cli
