#pragma once

#include <cstdint>
#include <string>

#include <json/value.h>

/// What 'status' tells of one share, for people.
namespace ferrox::cli {

/// "1 folder", "1,200 folders".
std::string FoldersText(uint64_t folders);

/// Prints a share's entry of the index daemon's status, to which AddWatches has added how its changes are noticed: a
/// line with its name, and below it, indented, its work, its watches, its index, its queue and what is missing.
/// `notification_problem`: "" when the notification daemon runs and answers, else what it does instead.
void PrintShare(const Json::Value& share, const std::string& notification_problem);

}  // namespace ferrox::cli
