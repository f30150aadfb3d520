#include <algorithm>
#include <cerrno>
#include <cstdio>
#include <functional>

#include <kova/notifyd.h>

#include "base/path.h"
#include "cli/ask.h"
#include "cli/command_table.h"
#include "cli/configuration_change.h"
#include "cli/escape.h"
#include "cli/explain.h"
#include "cli/folder_path.h"
#include "cli/format.h"
#include "cli/own_share.h"
#include "cli/rights.h"
#include "cli/share_remains.h"
#include "common/clock.h"
#include "common/error.h"
#include "common/file_util.h"
#include "common/log.h"
#include "fileindex/elastic/elastic_control.h"
#include "fileindex/folders/folder_mgr.h"
#include "fileindex/operations/index_mgr.h"
#include "fileindex/operations/watch_list.h"
#include "fileindex/queue/event.h"
#include "fileindex/queue/queue_file.h"
#include "fileindex/status_mgr.h"
#include "fileindex/util.h"
#include "sdk/share.h"
#include "wire/engine_requests.h"

/// A share gets another name or another folder. The table of shares goes first, since the library asks it where the
/// share is; each step may be repeated, so that the same command finishes what an earlier run has begun.
namespace ferrox::cli {

namespace {

using kova::host::ShareEntry;

/// The daemon's worker is waited for: 3 s in all.
constexpr int kWorkerLooks = 15;
constexpr std::chrono::milliseconds kWorkerPause(200);

/// From where to where; the names are equal in a migration.
struct Move {
  std::string old_name;
  std::string new_name;
  std::string old_path;
  std::string new_path;
};

/// Their paths in the table would not be right any more.
void RefuseSharesBelow(const ShareEntry& entry) {
  for (const ShareEntry& other : kova::host::ListShares()) {
    if (other.name != entry.name && base::IsBelow(other.path, entry.path)) {
      throw Failure("share " + other.name + " lies in share " + entry.name +
                    "; remove it first ('fileindexctl share remove " + other.name + "'), and add it again afterwards");
    }
  }
}

/// Moves the share in the table while nothing works on it: its worker would take the folder for deleted.
void MoveInTable(const std::string& share, const std::function<void()>& move) {
  (void)AskIndexDaemonIfRunning("worker_delete", ShareName(share));
  try {
    move();
  } catch (const std::exception&) {
    NotifySettingChanged(share);  // it goes on as before
    throw;
  }
}

/// Renames the share's folder, unless somebody has done that already. @return whether it was done here.
bool RenameFolder(const std::string& from, const std::string& to) {
  const bool old_there = Exists(from);
  const bool new_there = Exists(to);
  if (old_there && new_there) throw Failure(to + " exists already; move it away, or choose another name");
  if (!old_there && !new_there) throw Failure(from + " does not exist; bring it back first");
  if (new_there) return false;
  if (rename(from.c_str(), to.c_str()) != 0) {
    ThrowSystemFailure(errno, "rename", from, "; rename it yourself to " + to + ", then run this command again");
  }
  (void)SyncFolder(Dirname(to));
  return true;
}

/// The folder first: the table takes only a folder that is there. When the table refuses, the folder gets its old name
/// back, unless somebody else gave it the new one.
void RenameInTable(const Move& move) {
  const bool renamed_here = RenameFolder(move.old_path, move.new_path);
  try {
    kova::host::RenameShare(move.old_name, move.new_name, move.new_path);
  } catch (const kova::host::ShareTableError&) {
    if (renamed_here) (void)rename(move.new_path.c_str(), move.old_path.c_str());
    throw;
  }
}

/// A run that was interrupted may have got to any of its steps, and a daemon that was started since may have made an
/// empty index of the new name.
void RenameIndex(const Move& move) {
  try {
    fileindex::ShareRename(move.old_name, move.new_name);
  } catch (const Error& error) {
    const bool both = error.Code() == Error::kEngineIndexExists;
    if (!both && error.Code() != Error::kEngineNoSuchIndex) throw;
    if (both) fileindex::elastic::ShareIndexDelete(move.old_name);
    fileindex::AddCustomEvent(fileindex::EVENT_RENAME, move.new_path, move.old_path, Json::Value());
  }
  const int bits = fileindex::StatusMgr().GetShareStatus(move.old_name);
  if (bits == 0) return;
  fileindex::StatusMgr().SetShareStatus(move.new_name, bits);
  fileindex::StatusMgr().ClearShareStatus(move.old_name);
}

/// Whether the index daemon works on the share at its new place.
bool HasWorkerAt(const Json::Value& daemon, const Move& move) {
  return TextOf(ShareIn(daemon, move.new_name), "path") == move.new_path;
}

/// Registers the new place and has the share's worker go on there. A daemon that does not run looks when it starts; one
/// that runs may have asked Samba for its shares a moment ago, and then knows the new place only in a second.
void GoOn(const Move& move) {
  Json::Value daemon = AskIndexDaemonIfRunning("status", Json::Value());
  try {
    fileindex::ShareResume(move.new_name);
  } catch (const Error& error) {
    if (!daemon.isNull() || error.Code() != Error::kInternal) throw;
  }
  if (!fileindex::FolderMgr().IsShareIndexed(move.new_name)) return;
  for (int i = 0; i < kWorkerLooks && !daemon.isNull(); ++i) {
    daemon = AskIndexDaemonIfRunning("status", Json::Value());
    if (HasWorkerAt(daemon, move)) return;
    Clock::Get().SleepFor(kWorkerPause);
    NotifySettingChanged(move.new_name);
  }
}

/// What comes once the platform has the share at its new place. The lines of the old queue are superseded by the event
/// of the move, which has both places compared with the index.
void Follow(const Move& move, void (*move_index)(const Move& move), const std::string& again) {
  const std::string rest =
      "the share is at " + move.new_path + " now, but its index does not follow yet: run '" + again + "' to finish";
  try {
    const bool paused = IsPaused(move.old_name) || IsPaused(move.new_name);
    const std::string old_queue = QueueOf(move.old_path);
    (void)KOVA::KOVANOTIFYD::MonitorQueue::Delete(old_queue, fileindex::kAppName,
                                                  KOVA::KOVANOTIFYD::MONITOR_QUEUE_TYPE_APPLICATION);
    move_index(move);
    // A share that was paused stays so; its index has moved, and the event waits in its queue.
    if (!paused) GoOn(move);
    fileindex::RemoveQueueFiles(old_queue);
  } catch (const Error& error) {
    throw Failure(Explain(error, rest));
  } catch (const Failure& failure) {
    throw Failure(std::string(failure.what()) + "; " + rest);
  }
}

/// Whether the share's index still has documents of its old place.
bool HasDocumentsBelow(const std::string& share, const std::string& old_path) {
  const Json::Value request = wire::FindDocumentsRequest(fileindex::elastic::GetFileIndexID(share),
                                                         {.which = wire::AllBelow(old_path), .limit = 1});
  return HasIndex(share) && !AskEngine(request).empty();
}

/// Whether anything still bears the share's old name or lies at its old place.
bool HasRemains(const Move& move) {
  const std::string queue = QueueOf(move.old_path);
  return fileindex::FolderMgr().IsShareIndexed(move.old_name) || HasIndex(move.old_name) || Exists(queue) ||
         Exists(fileindex::DetachedQueuePath(queue)) || IsPaused(move.new_name) ||
         HasDocumentsBelow(move.new_name, move.old_path);
}

/// What was renamed before, by Samba or by a run that was interrupted: the share has its new name.
Move RenamedBefore(const std::string& from, const std::string& to) {
  const std::string path = sdk::SDKShare(to).GetPath();
  const Move move = {from, to, Dirname(path) + "/" + from, path};
  if (!HasRemains(move)) throw Error(Error::kNoSuchShare, from);
  return move;
}

/// The whole way, of a share that has its old name still. @throws Failure; Error kNoSuchShare.
Move RenameHere(const std::string& from, const std::string& to) {
  const ShareEntry own = OwnShare(from, "rename");
  if (IsShare(to)) throw Failure("there is a share \"" + to + "\" already; choose another name");
  RefuseSharesBelow(own);
  const Move move = {from, to, own.path, Dirname(own.path) + "/" + to};
  MoveInTable(from, [&] { RenameInTable(move); });
  return move;
}

}  // namespace

/// Where the old name is gone and the new one there, an earlier run or the file-sharing service has renamed the share,
/// and only what follows is left to do.
int RunShareRename(const Arguments& arguments) {
  const std::string& from = arguments.words[0];
  const std::string& to = arguments.words[1];
  if (from == to) throw UsageError("the old and the new name are the same");
  if (!IsPathName(to)) {
    throw UsageError("\"" + EscapeForTerminal(to) + "\" cannot be a share's name; give a name without \"/\"");
  }
  RequireEngine();
  const Move move = !IsShare(from) && IsShare(to) ? RenamedBefore(from, to) : RenameHere(from, to);
  const bool indexed = HasRemains(move) || fileindex::FolderMgr().IsShareIndexed(to);
  if (indexed) Follow(move, &RenameIndex, "fileindexctl share rename " + from + " " + to);
  (void)printf("share %s is now %s: %s%s\n", EscapeForTerminal(from).c_str(), EscapeForTerminal(to).c_str(),
               EscapeForTerminal(move.new_path).c_str(), indexed ? "; its index follows" : "");
  return kDone;
}

/// The files have been moved by other means. With --from the place they came from is given when the table already has
/// the new one.
int RunShareMigrate(const Arguments& arguments) {
  const std::string& name = arguments.words[0];
  const std::string here = sdk::SDKShare(name).GetPath();
  const std::string new_path = AbsolutePath(arguments.words[1]);
  const Move move = {name, name, arguments.Has("--from") ? AbsolutePath(arguments.Get("--from")) : here, new_path};
  const std::string again = "fileindexctl share migrate " + name + " " + new_path + " --from " + move.old_path;
  if (move.old_path == new_path) {
    throw Failure("share " + name + " is at " + new_path + " already; --from says where it was before");
  }
  RequireEngine();
  if (here != new_path) {
    RefuseSharesBelow(OwnShare(name, "move"));
    MoveInTable(name, [&] { kova::host::MoveShare(name, new_path); });
  }
  const bool indexed = fileindex::FolderMgr().IsShareIndexed(name);
  if (indexed) {
    Follow(
        move, [](const Move& moved) { fileindex::ShareMigrate(moved.new_name, moved.old_path, moved.new_path); },
        again);
  }
  (void)printf("share %s is at %s%s\n", EscapeForTerminal(name).c_str(), EscapeForTerminal(new_path).c_str(),
               indexed ? "; its index follows" : "; no folder of it is indexed");
  return kDone;
}

}  // namespace ferrox::cli
