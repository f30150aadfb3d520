#pragma once

#include <cstdint>
#include <set>
#include <string>
#include <string_view>

namespace ferrox::notifyd {

/// Appends one line of a queue (docs/formats/queue.md) with its newline to `text`. Names may hold any bytes but NUL.
void AppendQueueLine(std::string& text, uint32_t event, bool is_folder, std::string_view path,
                     std::string_view path_old);

/// The same, a line that calls files changed by their numbers. `folder` is one that the queue watches.
void AppendFilesLine(std::string& text, std::string_view folder, const std::set<uint64_t>& files);

}  // namespace ferrox::notifyd
