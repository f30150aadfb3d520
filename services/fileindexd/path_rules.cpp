#include "services/fileindexd/path_rules.h"

#include <cerrno>

#include <kova/fs.h>

#include "base/path.h"
#include "common/error.h"
#include "common/file_util.h"
#include "fileindex/util.h"
#include "sdk/share.h"

namespace ferrox::indexd {

namespace {

constexpr size_t kFoldersRemembered = 10000;

bool InSnapshot(const std::string& path) {
  int in_snapshot = 0;
  return KLIBFhsPathInSnapshot(path.c_str(), &in_snapshot) == 0 && in_snapshot == 1;
}

/// Of a folder that is gone, only its place can be judged: it may be an old or a passing name of one that is indexed,
/// and the operations that follow still need its documents. @throws Error when the platform does not say which share
/// the folder lies in: that does not mean that it is left out, which would cost its documents.
bool AskAllRules(const std::string& folder) {
  struct stat status = {};
  const bool gone = lstat(folder.c_str(), &status) != 0 && (errno == ENOENT || errno == ENOTDIR);
  if (gone) return !fileindex::IsFullPathInRecycleBin(folder);
  return fileindex::CanFullPathBeIndexed(folder) && !InSnapshot(folder);
}

}  // namespace

std::string ShareProblem(const std::string& share, const std::string& root) {
  const int type = KOVAGetFSType(root.c_str(), 0);
  if (type < 0 || type == KOVA_FS_PSEUDO) return root + " lies on a file system that holds no files of users";
  if (KOVAFSIsRemoteFS(type) != 0) return root + " lies on another machine; index it there";
  if (KOVAFSIsImageFS(type) != 0) return root + " is a mounted image, which is not indexed";
  if (RealPath(root) != root) return root + " leads through a link; give the share its real folder";
  if (!sdk::SDKShare(share).CanBeIndexed()) return "the share is locked or read-only";
  return "";
}

PathRules::PathRules(const std::string& share, const std::string& root, const ShareFolders& folders,
                     services::Exclusions& exclusions)
    : share_(share), root_(root), folders_(folders), exclusions_(exclusions) {}

bool PathRules::SkipName(const std::string& name) { return fileindex::IsSystemPreservedFileName(name); }

PathRules::Place PathRules::PlaceOf(const std::string& path) {
  if (folders_.PlaceOf(path) == Place::kOutside || IsExcluded(path)) return Place::kOutside;
  struct stat status = {};
  return PlaceOf(path, lstat(path.c_str(), &status) == 0 && S_ISDIR(status.st_mode));
}

PathRules::Place PathRules::PlaceOf(const std::string& path, bool is_folder) {
  const Place place = PlaceByPatterns(path, is_folder);
  return place == Place::kOutside || IsLeftOut(path, is_folder) ? Place::kOutside : place;
}

/// Of what is left out by patterns, a folder may be on the way to one that is indexed by itself.
PathRules::Place PathRules::PlaceByPatterns(const std::string& path, bool is_folder) {
  const Place place = folders_.PlaceOf(path);
  if (place != Place::kIndexed || !exclusions_.LeavesOut(path, is_folder)) return place;
  return is_folder && folders_.HasBelow(path) ? Place::kOnTheWay : Place::kOutside;
}

bool PathRules::IsExcluded(const std::string& path) {
  return folders_.PlaceOf(path) == Place::kIndexed && exclusions_.LeavesOutAll(path) && !folders_.HasBelow(path);
}

bool PathRules::IsLeftOut(const std::string& path, bool is_folder) {
  if (path == root_) return false;
  if (!base::IsBelow(path, root_)) return true;
  return is_folder ? FolderIsLeftOut(path) : SkipName(Basename(path)) || FolderIsLeftOut(Dirname(path));
}

bool PathRules::FolderIsLeftOut(const std::string& folder) {
  if (folder == root_) return false;
  const auto known = left_out_.find(folder);
  if (known != left_out_.end()) return known->second;
  const bool answer = FolderIsLeftOut(Dirname(folder)) || SkipName(Basename(folder)) || !AskAllRules(folder);
  if (left_out_.size() >= kFoldersRemembered) left_out_.clear();
  left_out_[folder] = answer;
  return answer;
}

bool PathRules::MayEnter(const std::string& path, const struct stat& status, dev_t parent_device) const {
  if (folders_.IsInInner(path)) return false;
  const std::string name = Basename(path);
  const bool telling_name =
      name.find("#snapshot") != std::string::npos || name.find("#recycle") != std::string::npos || share_ == "homes";
  if (!telling_name && status.st_dev == parent_device && KOVAFSDirIsMntPoint(path.c_str()) == 0) return true;
  return AskAllRules(path);
}

}  // namespace ferrox::indexd
