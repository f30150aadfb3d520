#pragma once

#include <string>
#include <vector>

#include <json/value.h>

#include "services/kovaelasticd/commands/named_users.h"
#include "services/kovaelasticd/indices/registry.h"

namespace ferrox::engine {

/// The names in the rules of all shares, each once, in ascending order. Beyond 10,000 names or 1 MiB some are left out:
/// nobody is known to be meant by those, or not to be.
std::vector<std::string> NamesInRules(const std::vector<Registry::Listed>& listed);

/// Whether a share's rules (ShareNote::rules) let in a user for whom another program asks. Where they are missing, have
/// another shape or cannot be judged, they do not.
bool RulesLetIn(const Json::Value& rules, const NamedUser& user);

}  // namespace ferrox::engine
