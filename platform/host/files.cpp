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
#include <memory>
#include <sstream>
#include <utility>

#include <json/reader.h>

#include <kova/lock_holder.h>

namespace kova::host {

namespace {

constexpr std::chrono::seconds kLockMax(10);

bool ReadAll(int fd, std::string& text) {
  char buffer[16384];
  for (;;) {
    const ssize_t got = read(fd, buffer, sizeof(buffer));
    if (got == 0) return true;
    if (got < 0 && errno == EINTR) continue;
    if (got < 0 || text.size() > kFileMaxBytes) return false;
    text.append(buffer, static_cast<size_t>(got));
  }
}

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
  Json::CharReaderBuilder builder;
  Json::CharReaderBuilder::strictMode(&builder.settings_);
  builder["failIfExtra"] = true;
  const std::unique_ptr<Json::CharReader> reader(builder.newCharReader());
  std::string errors;
  try {
    if (reader->parse(text.data(), text.data() + text.size(), &value, &errors)) return {};
  } catch (const std::exception& error) {
    errors = error.what();
  }
  value = Json::Value();
  return "is not JSON: " + OneLine(errors);
}

/// O_NONBLOCK: a FIFO at the path must not hold the opener.
int OpenLockFile(const std::string& path) {
  if (!MakeFolders(FolderOf(path), 0755) || !MakeLockFilePrivate(path)) return -1;
  return open(path.c_str(), O_RDWR | O_CREAT | O_CLOEXEC | O_NOFOLLOW | O_NONBLOCK, 0600);
}

/// Gives an open file the owner and the mode of `like`; chown takes bits of the mode away and goes first.
bool Dress(int fd, const struct stat& like) {
  struct stat now = {};
  if (fstat(fd, &now) != 0) return false;
  const bool owned = now.st_uid == like.st_uid && now.st_gid == like.st_gid;
  return (owned || fchown(fd, like.st_uid, like.st_gid) == 0) && fchmod(fd, like.st_mode & 07777) == 0;
}

/// 0, or why the lock cannot be had: an error number.
int LockUntil(int fd, std::chrono::steady_clock::time_point deadline) {
  constexpr int kPollMs = 20;
  while (flock(fd, LOCK_EX | LOCK_NB) != 0) {
    const int problem = errno;
    const bool is_held = problem == EINTR || problem == EWOULDBLOCK;
    if (!is_held || std::chrono::steady_clock::now() > deadline) return problem;
    (void)poll(nullptr, 0, kPollMs);
  }
  return 0;
}

bool SyncFolder(const std::string& path) {
  const Fd folder(open(path.c_str(), O_RDONLY | O_DIRECTORY | O_CLOEXEC));
  return folder.Valid() && fsync(folder.Get()) == 0;
}

}  // namespace

Fd::~Fd() {
  if (fd_ >= 0) (void)close(fd_);
}

bool Fd::Close() { return close(std::exchange(fd_, -1)) == 0; }

int Fd::Release() { return std::exchange(fd_, -1); }

ExclusiveLock::ExclusiveLock(const std::string& path) : path_(path) {
  const auto deadline = std::chrono::steady_clock::now() + kLockMax;
  do {  // it may just have been replaced
    file_ = std::make_unique<Fd>(OpenLockFile(path));
    problem_ = file_->Valid() ? LockUntil(file_->Get(), deadline) : errno;
  } while (problem_ == 0 && !IsStillAt(file_->Get(), path));
}

std::string ExclusiveLock::ProblemText() const {
  const std::string holder = problem_ == EWOULDBLOCK ? LockHolderText(path_) : std::string();
  return "cannot lock " + path_ + ": " +
         (holder.empty() ? std::string(strerror(problem_)) : holder + "; end it if it hangs, and try again");
}

std::string FolderOf(const std::string& path) {
  const size_t slash = path.rfind('/');
  if (slash == std::string::npos) return ".";
  return slash == 0 ? "/" : path.substr(0, slash);
}

std::string NameOf(const std::string& path) { return path.substr(path.rfind('/') + 1); }

bool MakeFolders(const std::string& path, mode_t mode) {
  if (path.empty()) return true;
  bool made = mkdir(path.c_str(), mode) == 0;
  if (!made && errno == ENOENT) made = MakeFolders(FolderOf(path), mode) && mkdir(path.c_str(), mode) == 0;
  return made ? SyncFolder(FolderOf(path)) : errno == EEXIST;
}

std::string ReadTextFile(const std::string& path, std::string& text, struct stat* info) {
  struct stat own = {};
  if (info == nullptr) info = &own;
  *info = {};
  text.clear();
  const Fd file(open(path.c_str(), O_RDONLY | O_CLOEXEC | O_NONBLOCK));
  if (!file.Valid()) return errno == ENOENT ? std::string() : std::string("cannot be read: ") + strerror(errno);
  if (fstat(file.Get(), info) != 0 || !S_ISREG(info->st_mode)) return "is not a regular file";
  return ReadAll(file.Get(), text) ? std::string() : "cannot be read whole";
}

std::string ReadJsonFile(const std::string& path, Json::Value& value) {
  value = Json::Value();
  std::string text;
  struct stat info = {};
  const std::string problem = ReadTextFile(path, text, &info);
  return !problem.empty() || info.st_ino == 0 ? problem : Parse(text, value);
}

bool WriteAll(int fd, const char* data, size_t size) {
  while (size > 0) {
    const ssize_t written = write(fd, data, size);
    if (written < 0 && errno == EINTR) continue;
    if (written <= 0) return false;
    data += written;
    size -= static_cast<size_t>(written);
  }
  return true;
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
  Fd file(mkostemp(temporary.data(), O_CLOEXEC));
  if (!file.Valid()) return false;
  const bool replaced = WriteAll(file.Get(), content.data(), content.size()) && Dress(file.Get(), like) &&
                        fsync(file.Get()) == 0 && file.Close() && rename(temporary.c_str(), path.c_str()) == 0;
  if (replaced) return SyncFolder(FolderOf(path));
  const int saved_errno = errno;
  (void)unlink(temporary.c_str());
  errno = saved_errno;
  return false;
}

bool RemoveFile(const std::string& path) { return unlink(path.c_str()) == 0 && SyncFolder(FolderOf(path)); }

}  // namespace kova::host
