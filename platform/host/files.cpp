#include "platform/host/files.h"

#include <fcntl.h>
#include <poll.h>
#include <sys/file.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>
#include <chrono>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <exception>
#include <sstream>
#include <utility>

#include <kova/lock_holder.h>

#include "base/files.h"
#include "base/json.h"
#include "base/path.h"

namespace kova::host {

namespace {

constexpr std::chrono::seconds kLockMax(10);

/// The parser's messages stand in several lines; a sentence for the log has one.
std::string OneLine(const std::string& text) {
  std::istringstream words(text);
  std::string line;
  for (std::string word; words >> word;) {
    if (word == "*") continue;  // each message begins with it
    line += (line.empty() ? "" : " ") + word;
  }
  return line;
}

std::string Parse(const std::string& text, Json::Value& value) {
  std::string problem;
  try {
    if (base::ParseJson(text, base::JsonRules::kDocument, value, &problem)) return {};
  } catch (const std::exception& error) {  // callers of the platform's C functions expect no exception
    value = Json::Value();
    problem = error.what();
  }
  return "is not JSON: " + OneLine(problem);
}

/// O_NONBLOCK: a FIFO at the path must not hold the opener.
int OpenLockFile(const std::string& path) {
  if (!base::MakeFoldersDurably(base::FolderOf(path), 0755) || !MakeLockFilePrivate(path)) return -1;
  return open(path.c_str(), O_RDWR | O_CREAT | O_CLOEXEC | O_NOFOLLOW | O_NONBLOCK, 0600);
}

/// 0, or why the lock cannot be had: an error number.
int LockUntil(int fd, std::chrono::steady_clock::time_point deadline) {
  constexpr int kLockPollMs = 20;
  while (flock(fd, LOCK_EX | LOCK_NB) != 0) {
    const int problem = errno;
    const bool is_held = problem == EINTR || problem == EWOULDBLOCK;
    if (!is_held || std::chrono::steady_clock::now() > deadline) return problem;
    (void)poll(nullptr, 0, kLockPollMs);
  }
  return 0;
}

}  // namespace

ExclusiveLock::ExclusiveLock(const std::string& path) : path_(path) {
  const auto deadline = std::chrono::steady_clock::now() + kLockMax;
  do {  // it may just have been replaced
    file_.Reset(OpenLockFile(path));
    problem_ = file_.Valid() ? LockUntil(file_.Get(), deadline) : errno;
  } while (problem_ == 0 && !IsStillAt(file_.Get(), path));
}

std::string ExclusiveLock::ProblemText() const {
  const std::string holder = problem_ == EWOULDBLOCK ? LockHolderText(path_) : std::string();
  return "cannot lock " + path_ + ": " +
         (holder.empty() ? std::string(strerror(problem_)) : holder + "; end it if it hangs, and try again");
}

std::string ReadTextFile(const std::string& path, std::string& text, struct stat* info) {
  struct stat own = {};
  if (info == nullptr) info = &own;
  *info = {};
  text.clear();
  const base::UniqueFd file(open(path.c_str(), O_RDONLY | O_CLOEXEC | O_NONBLOCK));
  if (!file.Valid()) return errno == ENOENT ? std::string() : std::string("cannot be read: ") + strerror(errno);
  if (fstat(file.Get(), info) != 0 || !S_ISREG(info->st_mode)) return "is not a regular file";
  return base::ReadAll(file.Get(), text, kFileMaxBytes) ? std::string() : "cannot be read whole";
}

std::string ReadJsonFile(const std::string& path, Json::Value& value) {
  value = Json::Value();
  std::string text;
  struct stat info = {};
  const std::string problem = ReadTextFile(path, text, &info);
  return !problem.empty() || info.st_ino == 0 ? problem : Parse(text, value);
}

bool ReplaceFile(const std::string& path, const std::string& content, mode_t mode) {
  struct stat like = {};
  like.st_mode = mode;
  like.st_uid = geteuid();
  like.st_gid = getegid();
  return ReplaceFile(path, content, like);
}

bool ReplaceFile(const std::string& path, const std::string& content, const struct stat& like) {
  std::string temporary = path + ".XXXXXX";
  base::UniqueFd file(mkostemp(temporary.data(), O_CLOEXEC));
  if (!file.Valid()) return false;
  const base::FileAttributes attributes = {like.st_mode & 07777, like.st_uid, like.st_gid, true};
  return base::ReplaceFile(path, content, attributes, std::move(file), temporary);
}

bool RemoveFile(const std::string& path) { return unlink(path.c_str()) == 0 && base::SyncFolder(base::FolderOf(path)); }

}  // namespace kova::host
