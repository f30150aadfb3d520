#include "common/file_util.h"

#include <fcntl.h>
#include <limits.h>
#include <stdlib.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <memory>
#include <utility>

#include <kova/fs.h>
#include <kova/user.h>

#include "base/files.h"
#include "base/path.h"
#include "base/unique_fd.h"
#include "common/log.h"
#include "common/mutex.h"
#include "common/sdk_mutex.h"

namespace ferrox {

namespace {

constexpr size_t kPathBufferBytes = 4096;
constexpr int kLinkHopsMax = 40;  // as the kernel's own limit: links may point at each other
constexpr char kPackageUser[] = "Ferrox";

}  // namespace

bool IsFileExist(const std::string& path) {
  struct stat status = {};
  return lstat(path.c_str(), &status) == 0 && S_ISREG(status.st_mode);
}

bool IsDirExist(const std::string& path, bool follow) {
  std::string current = path;
  for (int hop = 0; hop <= kLinkHopsMax; ++hop) {
    struct stat status = {};
    if (lstat(current.c_str(), &status) != 0) return false;
    if (S_ISDIR(status.st_mode)) return true;
    if (!follow || !S_ISLNK(status.st_mode)) return false;
    char target[kPathBufferBytes] = {};
    if (readlink(current.c_str(), target, sizeof(target) - 1) < 0) return false;
    current = target;
  }
  return false;
}

bool IsDirentDir(const dirent& entry, const std::string& /*path*/) { return entry.d_type == DT_DIR; }

bool CheckACLPerm(const std::string& path, int perm) {
  const int mask = KOVAACLPermGet(path.c_str());
  return mask >= 0 && (mask & perm) != 0;
}

bool IsMountPoint(const std::string& path) { return KOVAFSDirIsMntPoint(path.c_str()) > 0; }

bool StringStartWith(const std::string& text, const std::string& prefix) {
  return text.compare(0, prefix.size(), prefix) == 0;
}

std::string Basename(const std::string& path) { return base::NameOf(path); }

std::string Dirname(const std::string& path) { return std::string(base::ParentOf(path)); }

std::string GetFileExtension(const std::string& path, bool lower) {
  const std::string base = Basename(path);
  const size_t dot = base.rfind('.');
  if (dot == std::string::npos) return {};
  std::string extension = base.substr(dot + 1);
  if (lower) std::transform(extension.begin(), extension.end(), extension.begin(), ToLowerAscii);
  return extension;
}

/// The kernel resolves a path at once, where realpath() asks it anew for each folder on the way.
std::string RealPath(const std::string& path) {
  char resolved[PATH_MAX];
  const base::UniqueFd opened(open(path.c_str(), O_PATH | O_CLOEXEC));
  const std::string link = "/proc/self/fd/" + std::to_string(opened.Get());
  const ssize_t size = opened.Valid() ? readlink(link.c_str(), resolved, sizeof(resolved)) : -1;
  const std::string_view found(resolved, size > 0 && size < PATH_MAX ? static_cast<size_t>(size) : 0);
  if (found.starts_with('/') && !found.ends_with(" (deleted)")) return std::string(found);
  return realpath(path.c_str(), resolved) != nullptr ? resolved : std::string();
}

bool Unlink(const std::string& path) { return unlink(path.c_str()) == 0 || errno == ENOENT; }

bool MVFileImpl(const std::string& src, const std::string& dst, const KOVAFileCopyOptions& options, int flag) {
  return KOVAFileCopy(src.c_str(), dst.c_str(), &options, flag) == 0;
}

bool MVFile(const std::string& src, const std::string& dst) {
  KOVAFileCopyOptions options = {};
  options.words[0] = 1;
  options.words[1] = 1;
  return MVFileImpl(src, dst, options, 1);
}

bool CPFile(const std::string& src, const std::string& dst) {
  KOVAFileCopyOptions options = {};
  options.words[0] = 1;
  return MVFileImpl(src, dst, options, 1);
}

bool ChownFerrox(const std::string& path) {
  uid_t uid = 0;
  gid_t gid = 0;
  {
    const LockMutex guard(sdk::SDKMutex());
    KOVAUser* found = nullptr;
    FERROX_FAIL_IF_AS(KOVAUserGet(kPackageUser, &found) < 0 || found == nullptr, "0 > KOVAUserGet(kPackageUser, &user)",
                      Error::kChownFailed);
    const std::unique_ptr<KOVAUser, decltype(&KOVAUserFree)> user(found, &KOVAUserFree);
    // The home service's state is asked for and has no effect.
    (void)KOVAServiceUserHomeIsEnabled(0, user.get());
    uid = user->uid;
    gid = user->gid;
  }
  return chown(path.c_str(), uid, gid) == 0;
}

bool WriteWholeFile(const std::string& path, std::string_view content) {
  struct stat like = {};
  const bool exists = stat(path.c_str(), &like) == 0;
  const std::string beside = path + ".new";
  base::UniqueFd file(open(beside.c_str(), O_WRONLY | O_CREAT | O_TRUNC | O_CLOEXEC | O_NOFOLLOW, 0600));
  // A file that is new keeps the group that it was made with, which in a set-group-ID folder is the folder's.
  if (!exists && file.Valid()) (void)fstat(file.Get(), &like);
  const base::FileAttributes attributes = {exists ? like.st_mode & 0777 : 0644, like.st_uid, like.st_gid, false};
  return base::ReplaceFile(path, content, attributes, std::move(file), beside);
}

bool SyncFolder(const std::string& folder) { return base::SyncFolder(folder); }

bool ReadWholeFile(const std::string& path, std::string& content) { return base::ReadWholeFile(path, content); }

}  // namespace ferrox
