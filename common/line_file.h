#pragma once

#include <string>
#include <string_view>

#include "common/export.h"

namespace ferrox {

/// Appends whole lines, the last with its newline, to the file at `path` by one write: they are there whole or not at
/// all. Half a line that another writer left is ended first. The file is made when missing (0644); a link is not
/// followed. Callers exclude each other by a lock of their own. False, with errno set (ENOSPC after a short write),
/// when anything fails.
FERROX_EXPORT bool AppendLines(const std::string& path, std::string_view lines);

}  // namespace ferrox
