#pragma once

#include <cstddef>
#include <cstdint>
#include <string>
#include <string_view>
#include <vector>

#include "base/path_table.h"

namespace ferrox::notifyd {

/// A name below a watched folder, which is the path cut to `root_size`. Shorter than PATH_MAX: however its bytes are
/// escaped, a line of two such paths is shorter than a queue's lines may be.
struct WatchedName {
  std::string_view path;
  bool is_folder = false;
  size_t root_size = 0;
};

/// The lines of one queue that wait to be appended, in their order and in few words: changes of one path are one line,
/// the creation, deletion or comparison of a folder stands for all below it, and what grows beyond a bound becomes the
/// comparison of folders. Whatever is left out, a reader that looks at the disk for each line, after all of them were
/// written, sees each path that changed.
///
/// A line is open while changes may still be folded into it. A rename closes those of both its names; that of a folder
/// closes all, since they may lie below it.
class QueueOutbox {
 public:
  explicit QueueOutbox(size_t max) : max_(max), limit_(max) {}

  /// A change that is one of the EVENT_ bits but a rename, or EVENT_REINDEX for a comparison. `mask` tells what the
  /// queue wants to hear of.
  void Add(uint32_t event, const WatchedName& name, uint32_t mask);
  void AddRename(const WatchedName& old_name, const WatchedName& name);

  /// Whether a waiting line makes its reader look at the content of that file.
  bool TellsContentOf(std::string_view path) const;

  size_t Size() const { return lines_.size(); }
  /// Makes the lines as few as they can be without loss; Format is called after it.
  void Tidy();
  /// Appends the lines from the `first` on to `text`, up to about `max_bytes` of them. @return how many.
  size_t Format(size_t first, size_t max_bytes, std::string& text) const;
  /// Forgets the first lines: they have been written.
  void RemoveFirst(size_t count);

 private:
  struct Line {
    uint32_t event = 0;
    bool is_folder = false;
    std::string path;
    size_t root_size = 0;
    std::string path_old = {};
    size_t root_size_old = 0;
  };

  static bool IsWhole(const Line& line);
  static uint32_t Folded(const Line& line, uint32_t event, bool is_folder, uint32_t mask);
  const Line* OpenLine(std::string_view path) const;
  bool IsBelowWhole(std::string_view path) const;
  void Fold(Line& line, uint32_t event, bool is_folder, uint32_t mask);
  void Append(Line line);
  void Close(std::string_view path);
  void CloseAll();
  void Bound();
  void TakeFolders();

  std::vector<Line> lines_;
  base::PathTable<size_t> open_;  // by path, the place of its open line in lines_
  size_t whole_ = 0;              // open lines that stand for all below their path
  bool may_cover_ = false;        // one of them came behind lines that it may stand for
  size_t max_;
  size_t limit_;  // so many lines are too many; more than max_ only where even the watched folders are
};

}  // namespace ferrox::notifyd
