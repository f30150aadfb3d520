#pragma once

#include <string>

#include "base/unique_fd.h"

namespace ferrox::notifyd {

/// A file whose times are set to find out how far a watcher has read (watcher.h). Setting them writes no data, so a
/// sync works on a full disk too.
class Cookie {
 public:
  /// Makes the file, and the folders above it, when they are missing.
  /// @throws Error kInternal when that fails.
  explicit Cookie(const std::string& path);

  const std::string& Path() const { return path_; }
  /// Sets the times to now. False, with errno set, when that fails.
  bool Touch() const;

 private:
  std::string path_;
  base::UniqueFd file_;
};

}  // namespace ferrox::notifyd
