#pragma once

#include <sys/stat.h>
#include <sys/types.h>

#include <string>

#include <json/value.h>

#include "base/unique_fd.h"

namespace kova::host {

/// Holds an exclusive lock on a file, made when missing as are the folders above it, for the time of a scope; others
/// cannot open it. Waits while another process or thread holds it, at most 10 s. Links are not followed, programs that
/// are started do not inherit it.
class ExclusiveLock {
 public:
  explicit ExclusiveLock(const std::string& path);
  /// 0 when the lock is held, else why not: an error number.
  int Problem() const { return problem_; }
  /// The same in words: a sentence that names the file, and the process that holds the lock.
  std::string ProblemText() const;

 private:
  std::string path_;
  base::UniqueFd file_;
  int problem_ = 0;
};

/// The largest file that is read whole.
constexpr size_t kFileMaxBytes = 16 << 20;

/// Reads a regular file of at most that size. `info`, when not null, is filled with what the text was read from; st_ino
/// 0 tells a missing file, which is an empty text and no problem. Returns what is wrong with the file, or an empty
/// text.
std::string ReadTextFile(const std::string& path, std::string& text, struct stat* info = nullptr);

/// The same for a JSON file. A missing file is an empty value.
std::string ReadJsonFile(const std::string& path, Json::Value& value);

/// base::ReplaceFile by a file of a name of its own, so that several processes may replace one path. False, with errno,
/// on failure, which it also is when the owner cannot be had.
bool ReplaceFile(const std::string& path, const std::string& content, mode_t mode);
/// The same, with the mode and the owner of `like`.
bool ReplaceFile(const std::string& path, const std::string& content, const struct stat& like);

/// Removes a file durably. False, with errno, on failure.
bool RemoveFile(const std::string& path);

}  // namespace kova::host
