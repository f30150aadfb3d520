#include "cli/share_place.h"

#include <sys/stat.h>

#include <kova/fs.h>

#include "base/path.h"
#include "cli/explain.h"
#include "common/error.h"
#include "common/file_util.h"
#include "fileindex/folders/folder_mgr.h"
#include "fileindex/util.h"
#include "platform/host/mounts.h"
#include "sdk/share.h"

namespace ferrox::cli {

namespace {

bool IsInSnapshot(const std::string& path) {
  int in_snapshot = 0;
  return KLIBFhsPathInSnapshot(path.c_str(), &in_snapshot) == 0 && in_snapshot == 1;
}

/// A mount's own rules come before those of a share that does not exist yet.
std::string WhyPlaceLeftOut(const std::string& folder) {
  if (IsInSnapshot(folder)) return folder + " is a snapshot; nothing in it is indexed";
  if (kova::host::IsMountRoot(folder) == 1) {
    return "another file system is mounted at " + folder + "; 'fileindexctl share add " + folder +
           "' makes it a share of its own";
  }
  try {
    if (fileindex::CanFullPathBeIndexed(folder)) return "";
    std::string share;
    std::string share_path;
    fileindex::GetShareNamePathByFullPath(share, share_path, folder);
    return folder + ": " + WhyNotIndexable(share_path);
  } catch (const Error&) {
    return "";  // it lies in no share yet
  }
}

}  // namespace

std::vector<SharePlace> IndexedSharesBelow(const std::string& root) {
  std::vector<SharePlace> below;
  for (const std::string& share : fileindex::FolderMgr().GetIndexedShares()) {
    try {
      const std::string path = sdk::SDKShare(share).GetPath();
      if (base::IsBelow(path, root)) below.push_back({share, path});
    } catch (const Error&) {
      continue;  // the list has folders of a share that is gone
    }
  }
  return below;
}

SharePlace IndexedShareOf(const std::string& path) {
  SharePlace deepest;
  for (SharePlace& place : IndexedSharesBelow("/")) {
    if (base::IsAtOrBelow(path, place.root) && place.root.size() > deepest.root.size()) deepest = std::move(place);
  }
  return deepest;
}

std::string WhyNameLeftOut(const std::string& name) {
  return fileindex::IsSystemPreservedFileName(name)
             ? "\"" + name + "\" is a name that systems give their own files, which are never indexed"
             : "";
}

std::string WhyFolderLeftOut(const std::string& root, const std::string& folder) {
  if (!base::IsBelow(folder, root)) return "";
  for (size_t end = folder.find('/', root.size() + 1);; end = folder.find('/', end + 1)) {
    const std::string place = folder.substr(0, end);
    std::string why = WhyNameLeftOut(Basename(place));
    if (why.empty()) why = WhyPlaceLeftOut(place);
    if (!why.empty() || end == std::string::npos) return why;
  }
}

}  // namespace ferrox::cli
