#pragma once

#include <cstdint>

/// What daemon and worker say to each other on the worker's descriptor 3 (docs/formats/extract.md).
namespace ferrox::extract {

inline constexpr int kWorkerSocket = 3;
/// The largest answer; what is announced beyond it is hostile.
inline constexpr uint32_t kAnswerMaxBytes = 4U << 20;

/// A request: this, sent together with the descriptor of the file, then the three texts one after the other.
struct RequestHeader {
  uint16_t reader_bytes;
  uint16_t extension_bytes;
  uint16_t name_bytes;
  uint16_t unused;
};

/// The exit status of a worker that could get no more memory.
inline constexpr int kExitNoMemory = 71;

}  // namespace ferrox::extract
