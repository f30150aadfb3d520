#pragma once

#include <set>
#include <string>

#include "base/path.h"
#include "base/path_table.h"

namespace ferrox::indexd {

/// Paths that tasks work on at and below which nobody else may.
class PathsUnderWay {
 public:
  /// Whether something at, above or below the path is worked on.
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
  base::PathTable<bool> paths_;
  std::set<std::string> ordered_;
};

}  // namespace ferrox::indexd
