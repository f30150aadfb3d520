#pragma once

#include <cstdint>
#include <string>
#include <vector>

namespace ferrox::notifyd {

/// One folder whose changes are to be written into a queue, as it was registered (docs/formats/notifyd.md).
struct QueueWatch {
  std::string path;                      ///< absolute
  uint32_t mask = 0;                     ///< EVENT_ bits (fileindex/queue/event.h) of the lines that are wanted
  std::vector<std::string> ignore = {};  ///< names; what has one anywhere below `path`, and all in it, is left out
};

}  // namespace ferrox::notifyd
