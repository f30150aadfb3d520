#include <cstdio>
#include <functional>

#include <kova/recycle.h>
#include <kova/string_list.h>

#include "cli/ask.h"
#include "cli/command_table.h"
#include "cli/configuration_change.h"
#include "cli/escape.h"
#include "cli/folder_path.h"
#include "cli/own_share.h"
#include "cli/share_remains.h"
#include "common/error.h"
#include "fileindex/elastic/elastic_control.h"
#include "fileindex/folders/folder_mgr.h"
#include "fileindex/operations/index_mgr.h"
#include "fileindex/operations/operation_error.h"
#include "fileindex/queue/queue_file.h"
#include "sdk/share.h"

/// What the host's administrator, or a script, tells of shares, volumes, homes and users.
namespace ferrox::cli {

namespace {

using fileindex::FolderMgr;

constexpr char kHomes[] = "homes";

/// The table of commands lists the values, so that no other comes here.
AUTH_TYPE Accounts(const Arguments& arguments) {
  const std::string accounts = arguments.Get("--accounts", "local");
  return accounts == "domain" ? AUTH_DOMAIN : accounts == "ldap" ? AUTH_LDAP : AUTH_LOCAL;
}

/// Tells the library of the homes' recycle bins, where there is one that is indexed.
int CompareHomes(const std::function<void()>& tell, const std::function<int(KLIBCSzList**)>& enumerate) {
  KLIBCSzList* list = KLIBCSzListAlloc(1024);
  const int bins = enumerate(&list);
  KLIBCSzListFree(list);
  if (bins < 0) throw Failure("the users' home folders cannot be read; check that the folder of share homes exists");
  const bool indexed = FolderMgr().IsShareIndexed(kHomes);
  if (bins > 0 && indexed) tell();
  if (!indexed) {
    (void)printf("nothing is compared: no folder of share %s is indexed\n", kHomes);
  } else if (bins == 0) {
    (void)printf("nothing is compared: no home has a recycle bin\n");
  } else {
    (void)printf("%d recycle bins of homes will be compared with the index\n", bins);
  }
  return kDone;
}

/// The platform renames the user's folder first: without it under its new name, there is nothing that could follow.
void RequireRenamed(const std::string& old_name, const std::string& new_name) {
  const std::string homes = sdk::SDKShare(kHomes).GetPath() + "/";
  RequireIndexed(kHomes, FolderMgr());
  if (Exists(homes + old_name)) {
    throw Failure(homes + old_name + " is still there; rename it to " + homes + new_name + " first");
  }
  if (!Exists(homes + new_name)) {
    throw Failure("there is neither " + homes + old_name + " nor " + homes + new_name + "; check the names");
  }
}

/// Makes the index that an operation stopped for. @throws OperationError, as the operation is not done then.
void MakeIndex(const std::string& share, const fileindex::OperationError& stopped) try {
  fileindex::elastic::ShareIndexCreate(share);
} catch (const Error& error) {
  throw fileindex::OperationError(error, stopped.NotDone());
}

/// The index of a share that is indexed at this moment is not dropped by mistake.
void RefuseActive(const std::string& share) {
  const FolderMgr configured;
  for (const auto& folder : configured.GetFolders()) {
    if (folder->GetShare() == share && !folder->IsPaused()) {
      throw Failure(folder->GetPath() + " is not paused; 'fileindexctl share pause " + share +
                    "' first, or 'fileindexctl folder delete' to stop indexing it");
    }
  }
}

}  // namespace

/// The library changes nothing for a share without folders; here that is said. A pause of a share that is paused does
/// no harm and is reported as such.
int RunSharePause(const Arguments& arguments) {
  const std::string name = IndexedShare(arguments.words[0]);
  RequireDaemons();
  return ChangeAndReport([&] { fileindex::SharePause(name); }, "share " + name + " was paused already");
}

int RunShareResume(const Arguments& arguments) {
  const std::string name = IndexedShare(arguments.words[0]);
  RequireDaemons();
  const auto resume = [&] {
    try {
      fileindex::ShareResume(name);
    } catch (const fileindex::OperationError& stopped) {
      // The engine has lost its list of indices: it finds the index in its folder, or makes an empty one.
      if (stopped.Code() != Error::kEngineNoSuchIndex) throw;
      MakeIndex(name, stopped);
      fileindex::ShareResume(name);
    }
  };
  return ChangeAndReport(resume, "share " + name + " was not paused");
}

/// Forgets also what is left of a share that is in no table any more, where the queue is found by the folder alone. Of
/// an existing share only one that is paused is forgotten.
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
  const std::string queue = QueueOf(path);
  const bool has_remains = FolderMgr().IsShareIndexed(name) || HasIndex(name) || Exists(queue) ||
                           Exists(fileindex::DetachedQueuePath(queue));
  if (!known && !has_remains)
    throw Failure("nothing is left of a share " + name + " at " + path + "; check the name and the folder");
  const int code =
      ChangeAndReport([&] { fileindex::ShareClearPaused(name, path); }, "share " + name + " had no indexed folder");
  fileindex::RemoveQueueFiles(queue);
  return code;
}

/// Queues a comparison of the share's recycle bin, for the moment after it was switched on or off: nothing in it is
/// indexed as long as it is one.
int RunShareCheckRecycle(const Arguments& arguments) {
  const std::string name = IndexedShare(arguments.words[0]);
  fileindex::ShareCheckRecycle(name);
  (void)printf("the recycle bin of share %s will be compared with the index\n", EscapeForTerminal(name).c_str());
  return kDone;
}

/// The recycle bins of the homes of one kind of accounts.
int RunHomeEnable(const Arguments& arguments) {
  const AUTH_TYPE accounts = Accounts(arguments);
  return CompareHomes([&] { fileindex::HomeEnable(accounts); },
                      [&](KLIBCSzList** list) { return KOVARecycleHomeEnumRecyclePathForAuthType(list, accounts); });
}

/// Those of all kinds, whichever was switched off: the library compares all.
int RunHomeDisable(const Arguments& arguments) {
  return CompareHomes([&] { fileindex::HomeDisable(Accounts(arguments)); }, &KOVARecycleHomeEnumRecyclePath);
}

/// Called after the platform has renamed the user and the home folder, which is checked.
int RunUserRename(const Arguments& arguments) {
  const std::string& old_name = arguments.words[0];
  const std::string& new_name = arguments.words[1];
  for (const std::string& name : arguments.words) {
    if (!IsPathName(name)) throw UsageError("\"" + EscapeForTerminal(name) + "\" cannot be a user's name");
  }
  if (old_name == new_name) throw UsageError("the old and the new name are the same");
  RequireRenamed(old_name, new_name);
  ChangeConfiguration([&] { fileindex::UserRename(old_name, new_name); });
  (void)printf("%s/%s: its index follows\n", EscapeForTerminal(sdk::SDKShare(kHomes).GetPath()).c_str(),
               EscapeForTerminal(new_name).c_str());
  return kDone;
}

}  // namespace ferrox::cli
