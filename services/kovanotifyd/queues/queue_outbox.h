#pragma once

#include <cstddef>
#include <cstdint>
#include <string>
#include <string_view>
#include <vector>

#include "base/path_table.h"

namespace ferrox::notifyd {

/// A name at or below a watched folder, which is the path cut to `root_size`. The path is shorter than PATH_MAX, so
/// that a line of two such paths, however their bytes are escaped, stays below a queue's limit for lines.
struct WatchedName {
  std::string_view path;
  bool is_folder = false;
  size_t root_size = 0;
};

/// The lines of one queue that wait to be appended, in their order and as few as possible: changes of one path are
/// folded into one line, a line for a whole folder (its creation, deletion or comparison) takes the place of those
/// below it, and beyond a number of lines all of them are replaced by comparisons of folders.
///
/// What this leaves out is never missed: a reader that compares the path of each line with the disk, after all of them
/// were written, comes to every path that changed.
///
/// A line is open while later changes may be folded into it. A rename closes those of both its names, so that what
/// happens behind it stays behind it; the rename of a folder closes all, since any of them may lie below it.
class QueueOutbox {
 public:
  /// Keeps at most `max` lines, or one for each watched folder if that is more.
  explicit QueueOutbox(size_t max) : max_(max), limit_(max) {}

  /// Adds a change: one of the EVENT_ bits except EVENT_RENAME, or EVENT_REINDEX for a comparison. `mask` has the kinds
  /// of changes that the queue wants.
  void Add(uint32_t event, const WatchedName& name, uint32_t mask);
  void AddRename(const WatchedName& old_name, const WatchedName& name);

  /// Whether a line that waits makes its reader read the content of that file.
  bool CoversContentOf(std::string_view path) const;

  size_t Size() const { return lines_.size(); }
  /// Drops the lines that a line for a whole folder added after them stands for. To be called before Format.
  void DropCovered();
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

  static bool CoversSubtree(const Line& line);
  static uint32_t FoldedEvent(const Line& line, uint32_t event, bool is_folder, uint32_t mask);
  const Line* OpenLine(std::string_view path) const;
  bool IsBelowSubtreeLine(std::string_view path) const;
  void Fold(Line& line, uint32_t event, bool is_folder, uint32_t mask);
  void Append(Line line);
  void Close(std::string_view path);
  void CloseAll();
  void ReduceLines();
  void ReplaceByComparisons();

  std::vector<Line> lines_;
  base::PathTable<size_t> open_;  ///< open lines: by path, the index in lines_
  size_t subtree_lines_ = 0;      ///< open lines that stand for everything below their path
  bool may_cover_ = false;        ///< one of these came behind lines that it may stand for
  size_t max_;
  size_t limit_;  ///< number of lines at which they are reduced; above max_ where reducing leaves more than that
};

}  // namespace ferrox::notifyd
