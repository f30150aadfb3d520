#pragma once

#include <string>

/// Where this instance keeps what belongs to a share: below "/var/lib/kova/fileindex" of the instance's root,
/// "queue/<escaped share path>.queue" and "db/<escaped share path>.index".
namespace kova {

/// The share path as one file name, different for different paths. "/" becomes "+" (the first is left out), other bytes
/// than letters, digits, "_", "-" and "." become "%XX", so that the path can be read back. An escaped text over 200
/// bytes is cut, and ends in "~" and a 128-bit hash of the whole path.
std::string EscapeSharePath(const std::string& share_path);

/// Compose the path and make the folders above it, those of the product for their owner alone. Empty, with the failure
/// recorded, when `share_path` is not absolute or a folder cannot be made.
std::string ComposeQueuePath(const std::string& share_path);
std::string ComposeDBPath(const std::string& share_path);

}  // namespace kova
