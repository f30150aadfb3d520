#pragma once

#include <cstdint>

/// What daemon, worker and template say to each other on the descriptor 3 of the latter (docs/formats/extract.md).
namespace ferrox::extract {

inline constexpr int kWorkerSocket = 3;
/// The largest JSON text of an answer; what is announced beyond it is hostile.
inline constexpr uint32_t kAnswerMaxBytes = 2U << 20;
/// The memory that a worker shares with the daemon. Its pages exist once they are written.
inline constexpr uint32_t kRegionBytes = 16U << 20;
/// Where in it the attachments begin, one behind the other; before them is room for the text.
inline constexpr uint32_t kAttachmentsAt = 1U << 20;

/// A request: this, sent together with the descriptor of the file, then the three texts one after the other.
struct RequestHeader {
  uint16_t reader_bytes;
  uint16_t extension_bytes;
  uint16_t name_bytes;
  uint16_t depth;   ///< how many files the file is inside of
  uint32_t number;  ///< the first request of a worker is 1
};

/// An answer: this, then the JSON text. The greeting answers request 0.
struct AnswerHeader {
  uint32_t json_bytes;
  uint32_t text_bytes;  ///< of the file's text, which lies at the beginning of the region
  uint32_t number;      ///< of the request, so that no answer is taken for another file's
};

/// The member of that JSON which lists the attachments in their order: [{"name", "bytes"}, ...].
inline constexpr char kAttachmentsMember[] = "attachments";

/// To a template, with the descriptors of the worker's socket and region. It answers with a ForkAnswer.
inline constexpr char kForkRequest = 'w';
struct ForkAnswer {
  int32_t pid;  ///< of the new worker, which is a child of the daemon's; below 0: the error number why there is none
};

/// The exit status of a worker that could get no more memory.
inline constexpr int kExitNoMemory = 71;

}  // namespace ferrox::extract
