#pragma once

#include <cstdint>
#include <string>
#include <string_view>

namespace ferrox::notifyd {

/// Appends one line of a queue (docs/formats/queue.md) with its newline to `text`. Names may hold any bytes but NUL.
void AppendQueueLine(std::string& text, uint32_t event, bool is_folder, std::string_view path,
                     std::string_view path_old);

}  // namespace ferrox::notifyd
