#include "cli/folder_path.h"

#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>
#include <climits>
#include <vector>

#include "base/path.h"
#include "cli/command.h"
#include "cli/did_you_mean.h"
#include "cli/own_share.h"
#include "cli/rights.h"
#include "common/error.h"
#include "common/file_util.h"
#include "fileindex/folders/folder_mgr.h"
#include "fileindex/util.h"
#include "sdk/share.h"

namespace ferrox::cli {

namespace {

/// The share path of a path on disk, "" when no share holds it. Asking the library would log a failure.
std::string SharePathOnDisk(const std::string& path) {
  std::string best;
  std::string best_folder;
  for (const std::string& name : sdk::SDKShare::Enum()) {
    const std::string folder = sdk::SDKShare(name).GetPath();
    if (!base::IsAtOrBelow(path, folder) || folder.size() < best_folder.size()) continue;
    best_folder = folder;
    best = "/" + name + path.substr(folder.size());
  }
  return best;
}

/// The full path of a share path; "" when there is no such share.
std::string FullPathInShare(const std::string& share_path) {
  const std::string name = share_path.substr(1, share_path.find('/', 1) - 1);
  if (!IsShare(name)) return {};
  return sdk::SDKShare(name).GetPath() + share_path.substr(1 + name.size());
}

/// What a path may be meant as that is neither a share path nor on the disk: an indexed folder, a share, or the same
/// path below a share of a name that is spelt alike.
std::string PathMeant(const std::string& text, const fileindex::FolderMgr& configured) {
  std::vector<std::string> known;
  for (const auto& folder : configured.GetFolders()) known.push_back(folder->GetPath());
  const size_t end = text.empty() || text[0] != '/' ? std::string::npos : text.find('/', 1);
  for (const std::string& share : sdk::SDKShare::Enum()) {
    known.push_back("/" + share);
    if (end != std::string::npos) known.push_back("/" + share + text.substr(end));
  }
  return DidYouMean(text, known);
}

/// The share path of what lies on disk, where a share holds it under this path; else why not. A path through a link is
/// refused and not followed: nothing is indexed under such a path, and the list would show another than was given.
std::string OnDisk(const std::string& text, const fileindex::FolderMgr& configured) {
  const std::string path = AbsolutePath(text);
  const std::string share_path = SharePathOnDisk(path);
  if (!share_path.empty()) return share_path;
  const std::string real = RealPath(path);
  if (!real.empty() && real != path && !SharePathOnDisk(real).empty()) {
    throw Failure(text + " is, without links, " + real + "; give that path");
  }
  if (real.empty()) (void)Exists(path);
  if (!real.empty()) {
    const std::string folder = IsDirExist(real, false) ? real : Dirname(real);
    throw Failure(text + " lies in no share; 'fileindexctl share add " + folder + "' makes " +
                  (folder == real ? "it" : "its folder") + " one" +
                  (sdk::SDKShare::Enum().empty() ? ", of which there are none yet"
                                                 : ", 'fileindexctl share list' shows the shares"));
  }
  const std::string meant = PathMeant(text, configured);
  throw Failure(text + " is neither in a share nor on the disk" + meant + (meant.empty() ? ";" : "") +
                " 'fileindexctl share list' shows the shares");
}

}  // namespace

bool Exists(const std::string& path) {
  struct stat status = {};
  if (lstat(path.c_str(), &status) == 0) return true;
  if (errno != ENOENT && errno != ENOTDIR) ThrowSystemFailure(errno, "look at", path);
  return false;
}

bool IsPathName(const std::string& text) {
  return !text.empty() && text.find('/') == std::string::npos && text != "." && text != "..";
}

std::string FromWorkingFolder(const std::string& text, const char* what) {
  if (!text.empty() && text[0] == '/') return text;
  char folder[PATH_MAX];
  if (getcwd(folder, sizeof(folder)) == nullptr) {
    throw Failure(std::string("the current folder is not known; give ") + what);
  }
  return std::string(folder) + "/" + text;
}

std::string CleanPath(const std::string& absolute, bool parents) {
  std::vector<std::string> kept;
  for (const std::string& part : Split(absolute, '/')) {
    if (part.empty() || part == ".") continue;
    if (!parents || part != "..") {
      kept.push_back(part);
    } else if (!kept.empty()) {
      kept.pop_back();
    }
  }
  std::string path;
  for (const std::string& part : kept) path += "/" + part;
  return path.empty() ? "/" : path;
}

std::string AbsolutePath(const std::string& text) {
  return CleanPath(FromWorkingFolder(text, "a path that begins with /"), true);
}

/// Entries of the list come first, as they stand, so that a folder whose share is gone can still be deleted.
std::string ToSharePath(const std::string& text, const fileindex::FolderMgr& configured) {
  if (text.empty()) throw UsageError("an empty path is no folder");
  if (configured.HasFolder(text)) return text;
  if (text[0] != '/') return OnDisk(text, configured);
  const std::string cleaned = CleanPath(text, false);
  if (configured.HasFolder(cleaned)) return cleaned;
  const std::string in_share = FullPathInShare(cleaned);
  if (in_share.empty()) return OnDisk(text, configured);
  const std::string as_disk_path = SharePathOnDisk(cleaned);
  // "/photo/a" is a share path and may be a path on disk: where only the latter exists, that is meant.
  return !as_disk_path.empty() && !Exists(in_share) && Exists(cleaned) ? as_disk_path : cleaned;
}

}  // namespace ferrox::cli
