#pragma once

#include <set>
#include <string>

#include "base/path.h"
#include "base/path_table.h"

namespace ferrox::indexd {

/// The paths that tasks work on. Two of them conflict when one is the other or lies below it: what both hold must be
/// worked on in order. Belongs to one thread.
class PathsUnderWay {
 public:
  /// Whether something at, above or below the path is in work, which a new task has to wait for.
  bool Overlaps(const std::string& path) const {
    const auto next = ordered_.lower_bound(path + "/");
    return (next != ordered_.end() && base::IsBelow(*next, path)) || paths_.HasAtOrAbove(path);
  }
  void Add(const std::string& path) {
    paths_.Insert(path, true);
    ordered_.insert(path);
  }
  void Clear() {
    paths_ = {};
    ordered_.clear();
  }
  size_t Count() const { return paths_.Size(); }

 private:
  base::PathTable<bool> paths_;    ///< finds what is at or above a path
  std::set<std::string> ordered_;  ///< the same paths, finds what is below one
};

}  // namespace ferrox::indexd
