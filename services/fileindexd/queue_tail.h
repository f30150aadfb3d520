#pragma once

#include <sys/types.h>

#include <cstddef>
#include <cstdint>
#include <set>
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

/// So many files are looked up by their numbers; of more, the whole share is compared.
inline constexpr size_t kChangedNumbersMax = 10000;

/// The numbers by which the lines of a queue call files changed, at most one more than kChangedNumbersMax.
std::set<uint64_t> ChangedNumbersIn(const std::string& queue_path);

}  // namespace ferrox::indexd
