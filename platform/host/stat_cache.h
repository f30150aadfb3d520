#pragma once

#include <sys/stat.h>

#include <functional>
#include <memory>
#include <mutex>
#include <string>

namespace kova::host {

/// What was read from a file, kept until the file changes: a look-up costs one stat. Safe for threads.
template <typename T>
class StatCache {
 public:
  /// The present content of `path`; `load` makes it anew when the file is another one than last time.
  std::shared_ptr<const T> Get(const std::string& path, const std::function<T(const std::string&)>& load) {
    struct stat now = {};
    if (stat(path.c_str(), &now) != 0) now = {};
    const std::lock_guard<std::mutex> guard(mutex_);
    if (content_ == nullptr || path != path_ || !SameFile(now)) {
      content_ = std::make_shared<const T>(load(path));
      path_ = path;
      seen_ = now;
    }
    return content_;
  }

  void Forget() {
    const std::lock_guard<std::mutex> guard(mutex_);
    content_.reset();
  }

 private:
  bool SameFile(const struct stat& now) const {
    return now.st_dev == seen_.st_dev && now.st_ino == seen_.st_ino && now.st_size == seen_.st_size &&
           now.st_mtim.tv_sec == seen_.st_mtim.tv_sec && now.st_mtim.tv_nsec == seen_.st_mtim.tv_nsec &&
           now.st_ctim.tv_sec == seen_.st_ctim.tv_sec && now.st_ctim.tv_nsec == seen_.st_ctim.tv_nsec;
  }

  std::mutex mutex_;
  std::string path_;
  struct stat seen_ = {};
  std::shared_ptr<const T> content_;
};

}  // namespace kova::host
