#include <cstdio>
#include <set>

#include <kova/recycle.h>

#include "cli/ask.h"
#include "cli/command_table.h"
#include "cli/configuration_change.h"
#include "cli/escape.h"
#include "cli/folder_path.h"
#include "cli/own_share.h"
#include "cli/share_remains.h"
#include "fileindex/folder_mgr.h"
#include "fileindex/index_mgr.h"
#include "sdk/share.h"

/// What the host's administrator, or a script, tells of shares, volumes, homes and users.
namespace ferrox::cli {

namespace {

using fileindex::FolderMgr;

/// Carries an operation out and tells what has become of which folders.
int ChangeAndReport(const std::function<void()>& change, const std::string& nothing) {
  const FolderMgr before;
  ChangeConfiguration(change);
  const FolderMgr after;
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

void RequireDaemons() {
  RequireEngine();
  RequireIndexDaemon();
}

AUTH_TYPE Accounts(const Arguments& arguments) {
  const std::string accounts = arguments.Get("--accounts", "local");
  return accounts == "domain" ? AUTH_DOMAIN : accounts == "ldap" ? AUTH_LDAP : AUTH_LOCAL;
}

int ReportHomes() {
  (void)printf("the recycle bins of the homes are compared with the index again\n");
  return kDone;
}

/// The index of a share that is indexed at this moment is not dropped by mistake.
void RefuseActive(const std::string& share) {
  const FolderMgr configured;
  for (const auto& folder : configured.GetFolders()) {
    if (folder->GetShare() == share && !folder->IsPaused()) {
      throw Failure(folder->GetPath() + " is not paused; 'fileindexctl share pause " + share +
                    "' first, or 'fileindexctl folder delete' to end its indexing");
    }
  }
}

}  // namespace

int RunSharePause(const Arguments& arguments) {
  const std::string name = sdk::SDKShare(arguments.words[0]).GetName();
  RequireIndexed(name, FolderMgr());
  RequireDaemons();
  return ChangeAndReport([&] { fileindex::SharePause(name); }, "share " + name + " was paused already");
}

int RunShareResume(const Arguments& arguments) {
  const std::string name = sdk::SDKShare(arguments.words[0]).GetName();
  RequireIndexed(name, FolderMgr());
  RequireDaemons();
  return ChangeAndReport([&] { fileindex::ShareResume(name); }, "share " + name + " was not paused");
}

int RunShareForget(const Arguments& arguments) {
  const std::string& name = arguments.words[0];
  const bool known = IsShare(name);
  if (!known && arguments.words.size() == 1) {
    throw UsageError("share \"" + EscapeForTerminal(name) + "\" is gone: also give the folder where it was");
  }
  if (known) RefuseActive(name);
  const std::string path =
      arguments.words.size() > 1 ? AbsolutePath(arguments.words[1]) : sdk::SDKShare(name).GetPath();
  RequireEngine();
  const int code =
      ChangeAndReport([&] { fileindex::ShareClearPaused(name, path); }, "share " + name + " had no indexed folder");
  RemoveQueue(QueueOf(path));
  return code;
}

int RunShareCheckRecycle(const Arguments& arguments) {
  fileindex::ShareCheckRecycle(arguments.words[0]);
  (void)printf("the recycle bin of share %s is compared with the index again\n",
               EscapeForTerminal(arguments.words[0]).c_str());
  return kDone;
}

int RunVolumePause(const Arguments& arguments) {
  const std::string volume = AbsolutePath(arguments.words[0]);
  RequireDaemons();
  return ChangeAndReport([&] { fileindex::VolumePause(volume); },
                         "no indexed folder that is not paused lies on " + volume);
}

int RunVolumeResume(const Arguments& arguments) {
  const std::string volume = AbsolutePath(arguments.words[0]);
  RequireDaemons();
  return ChangeAndReport([&] { fileindex::VolumeResume(volume); }, "no paused folder lies on " + volume);
}

/// The operation itself leaves the indices, as if they had gone with the volume; on this host they lie elsewhere.
int RunVolumeForget(const Arguments& arguments) {
  const std::string volume = AbsolutePath(arguments.words[0]);
  RequireEngine();
  const std::set<std::string> before = FolderMgr().GetIndexedShares();
  const int code =
      ChangeAndReport([&] { fileindex::VolumeClearPaused(volume); }, "no folder was paused with the volume " + volume);
  const std::set<std::string> after = FolderMgr().GetIndexedShares();
  for (const std::string& share : before) {
    if (after.count(share) == 0 && IsShare(share)) DropRemains(share, sdk::SDKShare(share).GetQueuePath());
  }
  return code;
}

int RunHomeEnable(const Arguments& arguments) {
  fileindex::HomeEnable(Accounts(arguments));
  return ReportHomes();
}

int RunHomeDisable(const Arguments& arguments) {
  fileindex::HomeDisable(Accounts(arguments));
  return ReportHomes();
}

int RunUserRename(const Arguments& arguments) {
  const sdk::SDKShare homes("homes");
  ChangeConfiguration([&] { fileindex::UserRename(arguments.words[0], arguments.words[1]); });
  (void)printf("%s/%s: the index follows\n", EscapeForTerminal(homes.GetPath()).c_str(),
               EscapeForTerminal(arguments.words[1]).c_str());
  return kDone;
}

}  // namespace ferrox::cli
