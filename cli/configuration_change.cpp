#include "cli/configuration_change.h"

#include <algorithm>
#include <cstdio>
#include <cstring>
#include <set>

#include "base/scope_exit.h"
#include "cli/command.h"
#include "cli/escape.h"
#include "cli/explain.h"
#include "common/file_util.h"
#include "common/log.h"
#include "common/paths.h"
#include "fileindex/folders/folder_mgr.h"
#include "fileindex/queue/queue_file.h"
#include "fileindex/status_mgr.h"
#include "sdk/share.h"

namespace ferrox::cli {

namespace {

constexpr char kNotDone[] = "Not done: ";

std::string g_not_done;
LogSink g_log = nullptr;

/// The log's line about the steps that a failed operation has not got to; it goes on into the log, like all.
void NoteNotDone(int priority, const char* line) {
  const char* found = strstr(line, kNotDone);
  if (found != nullptr) g_not_done = found + sizeof(kNotDone) - 1;
  g_log(priority, line);
}

std::string FoldersFile() {
  std::string content;
  (void)ReadWholeFile(InstancePath(kFileIndexFoldersCfgPath), content);
  return content;
}

}  // namespace

void ChangeConfiguration(const std::function<void()>& change) {
  const std::string before = FoldersFile();
  g_log = SetLogSink(&NoteNotDone);
  const base::ScopeExit restore([] { (void)SetLogSink(g_log); });
  try {
    change();
  } catch (const Error& error) {
    std::string note = g_not_done.empty() ? "" : "not done: " + g_not_done + "; ";
    note += FoldersFile() == before
                ? "the list of indexed folders is as it was"
                : "the list of indexed folders is changed, but the index may not follow: run 'fileindexctl up', then "
                  "'fileindexctl index' with the share's name";
    throw Failure(Explain(error, note));
  }
}

int ChangeAndReport(const std::function<void()>& change, const std::string& nothing) {
  const fileindex::FolderMgr before;
  ChangeConfiguration(change);
  const fileindex::FolderMgr after;
  bool changed = false;
  for (const auto& folder : before.GetFolders()) {
    const std::string path = EscapeForTerminal(folder->GetPath());
    std::shared_ptr<fileindex::Folder> now;
    if (after.HasFolder(folder->GetPath())) after.Get(now, folder->GetPath());
    if (now != nullptr && now->IsPaused() == folder->IsPaused()) continue;
    changed = true;
    (void)printf("%s: %s\n", path.c_str(), now == nullptr ? "forgotten" : now->IsPaused() ? "paused" : "goes on");
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

std::vector<std::string> IndexedShares(const std::vector<std::string>& names) {
  const fileindex::FolderMgr configured;
  for (const std::string& name : names) RequireIndexed(sdk::SDKShare(name).GetName(), configured);
  if (!names.empty()) return names;
  const std::set<std::string> indexed = configured.GetIndexedShares();
  return {indexed.begin(), indexed.end()};
}

}  // namespace ferrox::cli
