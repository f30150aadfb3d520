#pragma once

#include <set>
#include <string>

#include "common/file_util.h"

namespace ferrox::indexd {

/// Paths that tasks work on at and below which nobody else may.
class PathsUnderWay {
 public:
  /// Whether something at, above or below the path is worked on.
  bool Touch(const std::string& path) const {
    for (std::string above = path; above.size() > 1; above = Dirname(above)) {
      if (paths_.count(above) != 0) return true;
    }
    const auto next = paths_.lower_bound(path + "/");
    return next != paths_.end() && StringStartWith(*next, path + "/");
  }
  void Add(const std::string& path) { paths_.insert(path); }
  void Clear() { paths_.clear(); }
  size_t Count() const { return paths_.size(); }

 private:
  std::set<std::string> paths_;
};

}  // namespace ferrox::indexd
