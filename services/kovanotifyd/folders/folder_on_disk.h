#pragma once

#include <cstdint>
#include <functional>
#include <string>
#include <string_view>

#include "base/unique_fd.h"

namespace ferrox::notifyd {

/// Opens the folder at a path that has no symbolic link in it. Not valid, with errno set, when that fails; ELOOP for a
/// link.
base::UniqueFd OpenFolder(const std::string& path);

/// A number that differs between mounts: the mount's id, or the device's number where the kernel does not tell ids. 0
/// when neither can be found out.
uint64_t MountOf(int folder);

/// Whether the open folder is the one at the path now.
bool IsAt(const std::string& path, int folder);

/// Calls `visit` with the name of each folder in an open folder, without "." and ".." and links.
/// @return whether all of them were listed.
bool ListFolders(base::UniqueFd folder, const std::function<void(std::string_view name)>& visit);

}  // namespace ferrox::notifyd
