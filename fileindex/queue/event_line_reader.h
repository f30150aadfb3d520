#pragma once

#include <memory>
#include <string>
#include <string_view>

#include "base/unique_fd.h"

namespace ferrox::fileindex {

/// Reads a queue file line by line in bounded memory, whatever the file holds.
class EventLineReader {
 public:
  /// Opens the file; Valid tells whether that succeeded, errno why not.
  explicit EventLineReader(const std::string& queue_path);

  bool Valid() const { return file_.Valid(); }

  /// The next line without its newline; it lives until the next call. A last line needs no newline. Of a line over
  /// kQueueLineMaxBytes only the first kQueueLineMaxBytes + 1 bytes come: enough to be refused as too long.
  /// @return false at the end of the file. @throws Error kInternal "Failed to read queue, reason=...".
  bool Next(std::string_view& line);

 private:
  bool Fill();
  void SkipRestOfLine();

  std::unique_ptr<char[]> buffer_;
  base::UniqueFd file_;
  size_t start_ = 0;  ///< what was read and not handed out yet is [start_, end_) of the buffer
  size_t end_ = 0;
  bool skipping_ = false;  ///< the rest of a line that is too long comes next
};

}  // namespace ferrox::fileindex
