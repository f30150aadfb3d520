#pragma once

#include <sys/types.h>

#include <string>
#include <vector>

namespace ferrox::indexd {

/// Looks at what is appended to a queue meanwhile, and takes nothing from it. Belongs to one thread; the queue must not
/// be detached while it lives.
class QueueTail {
 public:
  explicit QueueTail(const std::string& queue_path) : path_(queue_path) {}

  /// The files that lines appended since the last call call new or changed, each once; of very many the first, the
  /// others come with the next call. Lines that say anything else are passed over.
  std::vector<std::string> NextChangedFiles();

 private:
  std::string path_;
  off_t read_ = 0;
};

}  // namespace ferrox::indexd
