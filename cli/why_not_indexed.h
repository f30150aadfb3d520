#pragma once

#include <string>

namespace ferrox::cli {

/// Why the index of `share` has no document of the file at `path`, a full path in the share's folder, or not yet: one
/// sentence with the remedy. Asks, in this order, what no configuration changes (there is no such file, it is a link,
/// its name, its place), what the configuration says (the folders, patterns, a pause), whether this user
/// may read it, and then what the index daemon says of it: it waits in the queue, it failed, nothing runs.
/// @throws Error; NotPermitted. A daemon that does not answer is part of the reason.
std::string WhyNotIndexed(const std::string& path, const std::string& share);

/// Why the content of a file that is in the index was not wanted: a pattern says so, or its kind is switched off for
/// its folder. "" when that is not so.
std::string WhyNameOnly(const std::string& path);

}  // namespace ferrox::cli
