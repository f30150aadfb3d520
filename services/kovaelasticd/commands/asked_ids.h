#pragma once

#include <string>
#include <vector>

#include "services/kovaelasticd/commands/commands.h"

namespace ferrox::engine {

/// For those who see everything: the ids of the indices that are asked, which "id", "ids" or "shares" name; without
/// these, all. `required` becomes the one that the whole request fails without. @throws Error kEngineBadRequest,
/// kEngineNoSuchIndex.
std::vector<std::string> AskedIds(const CommandCall& call, std::string& required);

}  // namespace ferrox::engine
