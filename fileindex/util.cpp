#include "fileindex/util.h"

#include <algorithm>
#include <cerrno>
#include <climits>
#include <utility>

#include <kova/fs.h>
#include <kova/recycle.h>
#include <kova/share.h>

#include "common/log.h"
#include "common/sdk_mutex.h"
#include "sdk/share.h"

namespace ferrox::fileindex {

namespace {

/// Of the platform's buffer, the terminating zero included.
constexpr size_t kShareNameBytes = 492;
constexpr int kEveryKindOfUser = 11;
constexpr int kNeverIndexedFS = KOVA_FS_PSEUDO;

/// Names beside those that the platform itself hides: what programs of the platform and other systems leave on a share.
const std::vector<std::string>& SystemPreservedNames() {
  static const std::vector<std::string> names = {".TemporaryItems", ".KOVAPPSDB", ".DS_Store"};
  return names;
}

bool Contains(const std::string& text, const char* part) { return text.find(part) != std::string::npos; }

/// The platform is asked only where the name of a snapshot folder stands in the path, which is cheap to see.
bool IsInSnapshot(const std::string& full_path) {
  int in_snapshot = 0;
  return Contains(full_path, "#snapshot") && KLIBFhsPathInSnapshot(full_path.c_str(), &in_snapshot) == 0 &&
         in_snapshot == 1;
}

bool IsOnIndexableFS(const std::string& full_path) {
  const int type = KOVAGetFSType(full_path.c_str(), 0);
  return type >= 0 && KOVAFSIsRemoteFS(type) == 0 && KOVAFSIsImageFS(type) == 0 && type != kNeverIndexedFS;
}

std::string ShareNameByFullPath(const std::string& full_path) {
  std::string share_name;
  std::string share_path;
  GetShareNamePathByFullPath(share_name, share_path, full_path);
  return share_name;
}

/// The share that a path lies in. The platform takes two questions for that: when the share has gone between them, the
/// path lies in the one around it. @throws Error as GetShareNamePathByFullPath; kNoSuchShare.
sdk::SDKShare ShareByFullPath(const std::string& full_path) {
  std::string asked;
  std::string name = ShareNameByFullPath(full_path);
  while (true) {
    try {
      return sdk::SDKShare(name);
    } catch (const Error&) {
      asked = std::exchange(name, ShareNameByFullPath(full_path));
      if (name == asked) throw;
    }
  }
}

/// Whether something other than the share's own file system is mounted at the path.
bool IsForeignMountPoint(const std::string& full_path, const sdk::SDKShare& share) {
  // An encrypted share is a mount of its own.
  return KOVAFSDirIsMntPoint(full_path.c_str()) == 1 && !share.IsEncryption();
}

}  // namespace

void GetShareNameByPath(std::string& share_name, const std::string& share_path) {
  FERROX_FAIL_IF(1 > share_path.size() || '/' != share_path.at(0), Error::kBadArgument);
  // find's npos, too, makes a length that substr cuts to the end.
  share_name = share_path.substr(1, share_path.find('/', 1) - 1);
}

std::string GetShareNameByPath(const std::string& share_path) {
  std::string share_name;
  GetShareNameByPath(share_name, share_path);
  return share_name;
}

void GetFullPath(std::string& full_path, const std::string& share_path) {
  const sdk::SDKShare share(GetShareNameByPath(share_path));
  full_path = Dirname(share.GetPath()) + share_path;
}

std::string GetFullPath(const std::string& share_path) {
  std::string full_path;
  GetFullPath(full_path, share_path);
  return full_path;
}

void GetShareNamePathByFullPath(std::string& share_name, std::string& share_path, const std::string& full_path) {
  char name[kShareNameBytes] = {};
  char path[PATH_MAX] = {};
  {
    const LockMutex guard(sdk::SDKMutex());
    FERROX_FAIL_IF(0 > KOVAShareNamePathGet(full_path.c_str(), name, sizeof(name), path, sizeof(path)),
                   Error::kInternal, "KOVAShareNamePathGet failed, full_path=" + full_path,
                   Subject{Subject::kShareOfPath, full_path});
  }
  share_name = name;
  share_path = path;
}

std::string ReplacePathShare(const std::string& path, const std::string& new_share, const std::string& old_share) {
  using std::string;
  const size_t pos = (path + "/").find("/" + old_share + "/");
  FERROX_FAIL_IF(string::npos == pos, Error::kBadArgument, "Cannot find share: " + old_share);
  return path.substr(0, pos + 1) + new_share + path.substr(std::min(pos + 1 + old_share.size(), path.size()));
}

bool IsFullPathInRecycleBin(const std::string& full_path) {
  const std::string share_name = ShareNameByFullPath(full_path);
  const LockMutex guard(sdk::SDKMutex());
  if (Contains(full_path, "#recycle") && KOVAShareIsShareRecycle(full_path.c_str()) == 1) return true;
  return share_name == "homes" && KOVARecycleUserHomePathIsExist(full_path.c_str(), kEveryKindOfUser) == 1;
}

bool CanFullPathBeIndexed(const std::string& full_path) {
  if (IsInSnapshot(full_path) || !IsOnIndexableFS(full_path)) return false;
  const sdk::SDKShare share = ShareByFullPath(full_path);
  if (!share.CanBeIndexed() || IsFullPathInRecycleBin(full_path) || IsForeignMountPoint(full_path, share)) return false;
  return !full_path.empty() && RealPath(full_path) == full_path;
}

bool CanPathBeIndexed(const std::string& share_path) { return CanFullPathBeIndexed(GetFullPath(share_path)); }

bool IsSystemPreservedFileName(const std::string& file_name) {
  if (KOVAEAIsHiddenDir(file_name.c_str()) == 1) return true;
  const std::vector<std::string>& names = SystemPreservedNames();
  return std::find(names.begin(), names.end(), file_name) != names.end();
}

}  // namespace ferrox::fileindex
