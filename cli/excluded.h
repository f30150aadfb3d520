#pragma once

#include <string>
#include <vector>

#include "services/support/exclusions.h"

namespace ferrox::cli {

/// What the administrator has set for a share; of one that is not there yet, the patterns for all folders.
/// @throws Failure when the settings cannot be told; Error.
services::ExclusionRules RulesOf(const std::string& share);

/// Which pattern keeps what is at `full_path`, in the folder of `share`, out of the index, or its content: as the index
/// daemon decides it, by the patterns as they are now. Nothing need be there. For root and the owner alone: it reads
/// the settings and ignore files. @throws Failure when the settings cannot be told; Error.
services::ExclusionReason WhyExcluded(const std::string& share, const std::string& full_path);

/// The same as a sentence without its end, "" when no pattern does: "the pattern "*.log" (line 3 of
/// /photo/.indexignore) leaves it out". Not escaped for a terminal.
std::string ExclusionText(const services::ExclusionReason& reason, const std::string& full_path);

/// The patterns for all folders, each list with its origin. @throws Failure.
std::vector<std::pair<std::string, base::PatternLists>> PatternsForAll();

}  // namespace ferrox::cli
