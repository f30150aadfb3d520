#pragma once

#include <sys/types.h>

#include <cstddef>
#include <cstdint>
#include <set>
#include <string>
#include <vector>

namespace ferrox::indexd {

/// Files and folders whose attributes changed.
struct AttributeChanges {
  std::set<std::string> paths;
  std::set<uint64_t> files;  ///< inode numbers; of these the names are not known
};

/// Reads the lines that are appended to a live queue, without taking them. Belongs to one thread; the queue must not be
/// detached while it lives.
class QueueTail {
 public:
  explicit QueueTail(const std::string& queue_path) : path_(queue_path) {}

  /// The files that lines appended since the last call call new or changed, each once; of very many the first, the
  /// others come with the next call. Lines that say anything else are passed over.
  std::vector<std::string> NextChangedFiles();
  /// What such lines, in the form in which the notification daemon writes them, call changed but not new: also what was
  /// written to, since one line stands for all that happened to a file. Of very many lines the first, as above.
  AttributeChanges NextAttributeChanges();

 private:
  std::string path_;
  off_t read_ = 0;
};

/// The documents of at most so many files are searched by inode number; with more, the whole share is compared.
inline constexpr size_t kChangedNumbersMax = 10000;

/// The inode numbers of files that lines of the queue call changed without a path (docs/formats/queue.md), at most one
/// more than kChangedNumbersMax.
std::set<uint64_t> ChangedNumbersIn(const std::string& queue_path);

}  // namespace ferrox::indexd
