#include "cli/configuration_change.h"

#include <algorithm>
#include <cstdio>
#include <set>

#include "cli/command.h"
#include "cli/escape.h"
#include "cli/explain.h"
#include "common/file_util.h"
#include "common/paths.h"
#include "fileindex/folders/folder_mgr.h"
#include "fileindex/operations/operation_error.h"
#include "fileindex/queue/queue_file.h"
#include "fileindex/status_mgr.h"
#include "sdk/share.h"

namespace ferrox::cli {

namespace {

/// The file's bytes, "" when there is none: enough to see whether it was changed.
std::string FoldersFile() {
  std::string content;
  (void)ReadWholeFile(InstancePath(kFileIndexFoldersCfgPath), content);
  return content;
}

}  // namespace

void ChangeConfiguration(const std::function<void()>& change) {
  const std::string before = FoldersFile();
  try {
    change();
  } catch (const Error& error) {
    const auto* stopped = dynamic_cast<const fileindex::OperationError*>(&error);
    std::string note = stopped == nullptr ? "" : "not done: " + stopped->NotDoneText() + "; ";
    note += FoldersFile() == before
                ? "the list of indexed folders was not changed"
                : "the list of indexed folders was changed, but the index may not follow: run 'fileindexctl up', then "
                  "'fileindexctl index' with the share's name";
    throw Failure(Explain(error, note));
  }
}

/// Goes by the list before and after, so that what is printed is what happened, also where an operation passes folders
/// over.
int ChangeAndReport(const std::function<void()>& change, const std::string& nothing) {
  const fileindex::FolderMgr before;
  ChangeConfiguration(change);
  const fileindex::FolderMgr after;
  bool changed = false;
  for (const auto& folder : before.GetFolders()) {
    const std::string path = EscapeForTerminal(folder->GetPath());
    std::shared_ptr<fileindex::Folder> now;
    if (after.HasFolder(folder->GetPath())) after.Get(now, folder->GetPath());
    // No operation that is reported in this way adds a folder, so that the list of before has them all.
    if (now != nullptr && now->IsPaused() == folder->IsPaused()) continue;
    changed = true;
    (void)printf("%s: %s\n", path.c_str(),
                 now == nullptr    ? "no longer indexed"
                 : now->IsPaused() ? "paused"
                                   : "resumed");
  }
  if (!changed) (void)printf("%s\n", EscapeForTerminal(nothing).c_str());
  return kDone;
}

bool IsPaused(const std::string& share) {
  const fileindex::FolderMgr configured;
  const auto& folders = configured.GetFolders();
  return std::any_of(folders.begin(), folders.end(),
                     [&](const auto& folder) { return folder->IsPaused() && folder->GetShare() == share; });
}

/// A detached queue is there as long as the daemon works on it.
bool MarkIfBusy(const std::string& share) {
  if (!IsFileExist(fileindex::DetachedQueuePath(sdk::SDKShare(share).GetQueuePath()))) return false;
  fileindex::StatusMgr().SetShareStatus(share, fileindex::StatusMgr::kNeedReindex);
  return true;
}

void RequireIndexed(const std::string& share, const fileindex::FolderMgr& configured) {
  if (configured.IsShareIndexed(share)) return;
  throw Failure("no folder of share \"" + share + "\" is indexed; 'fileindexctl folder add /" + share +
                "' adds all of it");
}

std::string IndexedShare(const std::string& name) {
  std::string known = sdk::SDKShare(name).GetName();
  RequireIndexed(known, fileindex::FolderMgr());
  return known;
}

std::vector<std::string> IndexedShares(const std::vector<std::string>& names) {
  const fileindex::FolderMgr configured;
  for (const std::string& name : names) RequireIndexed(sdk::SDKShare(name).GetName(), configured);
  if (!names.empty()) return names;
  const std::set<std::string> indexed = configured.GetIndexedShares();
  return {indexed.begin(), indexed.end()};
}

}  // namespace ferrox::cli
