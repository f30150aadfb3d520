#pragma once

#include <sys/stat.h>

#include <functional>
#include <memory>
#include <string>

#include "base/mutex.h"

namespace kova::host {

/// Whether two looks saw the same file with the same content.
inline bool SameFile(const struct stat& a, const struct stat& b) {
  return a.st_dev == b.st_dev && a.st_ino == b.st_ino && a.st_size == b.st_size &&
         a.st_mtim.tv_sec == b.st_mtim.tv_sec && a.st_mtim.tv_nsec == b.st_mtim.tv_nsec &&
         a.st_ctim.tv_sec == b.st_ctim.tv_sec && a.st_ctim.tv_nsec == b.st_ctim.tv_nsec;
}

/// What was read from a file, kept until the file changes: a look-up costs one stat. Safe for threads.
template <typename T>
class StatCache {
 public:
  /// The present content of `path`; `load` makes it anew when the file is another one than last time.
  std::shared_ptr<const T> Get(const std::string& path, const std::function<T(const std::string&)>& load) {
    struct stat now = {};
    if (stat(path.c_str(), &now) != 0) now = {};
    const base::MutexLock lock(mutex_);
    if (content_ == nullptr || path != path_ || !SameFile(now, seen_)) {
      content_ = std::make_shared<const T>(load(path));
      path_ = path;
      seen_ = now;
    }
    return content_;
  }

  void Forget() {
    const base::MutexLock lock(mutex_);
    content_.reset();
  }

 private:
  base::Mutex mutex_;
  std::string path_ BASE_GUARDED_BY(mutex_);
  struct stat seen_ BASE_GUARDED_BY(mutex_) = {};
  std::shared_ptr<const T> content_ BASE_GUARDED_BY(mutex_);
};

}  // namespace kova::host
