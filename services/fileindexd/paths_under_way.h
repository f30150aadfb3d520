#pragma once

#include <string>

#include "fileindex/path_table.h"

namespace ferrox::indexd {

/// Paths that tasks work on at and below which nobody else may.
class PathsUnderWay {
 public:
  /// Whether something at, above or below the path is worked on.
  bool Touch(const std::string& path) const { return paths_.HasBelow(path) || paths_.HasAtOrAbove(path); }
  void Add(const std::string& path) { paths_.Insert(path, true); }
  void Clear() { paths_ = {}; }
  size_t Count() const { return paths_.Size(); }

 private:
  fileindex::PathTable<bool> paths_;
};

}  // namespace ferrox::indexd
