#pragma once

#include <string>

#include "base/unique_fd.h"

namespace ferrox::notifyd {

/// A file whose times are set to find out how far a watcher is: nothing is written, so a full disk is no obstacle.
class Cookie {
 public:
  /// Makes the file, and the folders above it, when it is missing.
  /// @throws Error kInternal when that fails.
  explicit Cookie(const std::string& path);

  const std::string& Path() const { return path_; }
  /// False, with errno set, when it fails.
  bool Touch() const;

 private:
  std::string path_;
  base::UniqueFd file_;
};

}  // namespace ferrox::notifyd
