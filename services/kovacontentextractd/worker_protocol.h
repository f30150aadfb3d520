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
  uint32_t number;  ///< the first request of a worker is 1
};

/// An answer: this, then the JSON text and, behind a zero byte, the file's text. The greeting answers request 0.
struct AnswerHeader {
  uint32_t bytes;
  uint32_t number;  ///< of the request, so that no answer is taken for another file's
};

/// The exit status of a worker that could get no more memory.
inline constexpr int kExitNoMemory = 71;

}  // namespace ferrox::extract
