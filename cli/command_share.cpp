#include <algorithm>
#include <cerrno>
#include <cstdio>
#include <set>
#include <string>

#include "base/path.h"
#include "cli/ask.h"
#include "cli/command_table.h"
#include "cli/configuration_change.h"
#include "cli/escape.h"
#include "cli/excluded.h"
#include "cli/explain.h"
#include "cli/output.h"
#include "cli/own_share.h"
#include "cli/preview.h"
#include "cli/rights.h"
#include "cli/share_remains.h"
#include "common/error.h"
#include "common/file_util.h"
#include "fileindex/folders/folder_mgr.h"
#include "fileindex/operations/index_mgr.h"
#include "platform/host/share_rules.h"
#include "sdk/share.h"

/// The table of shares: adding, listing and removing. A share and its index are changed together, so that neither is
/// left without the other: what fails half way is taken back, or the same command finishes it.
namespace ferrox::cli {

namespace {

/// The folder without links, "." and "..", which is what a share's folder must be.
std::string RealFolder(const std::string& folder) {
  const std::string real = RealPath(folder);
  if (real.empty() && errno == ENOENT) throw Failure(folder + ": there is no such folder; make it first");
  if (real.empty()) ThrowSystemFailure(errno, "look at", folder);
  if (!IsDirExist(real, false)) throw Failure(folder + " is not a folder; only a folder can be a share");
  return real;
}

/// The paths of the share's indexed folders.
Json::Value FoldersOf(const std::string& share) {
  const fileindex::FolderMgr configured;
  Json::Value paths(Json::arrayValue);
  for (const auto& folder : configured.GetFolders()) {
    if (folder->GetShare() == share) paths.append(folder->GetPath());
  }
  return paths;
}

/// The deepest share that a folder lies in, not at, and that indexes it; "" for none.
std::string OuterOf(const std::string& path) {
  std::string outer;
  size_t depth = 0;
  for (const auto& share : kova::host::ListShares()) {
    if (share.path.size() <= depth || !base::IsBelow(path, share.path)) continue;
    for (const Json::Value& folder : FoldersOf(share.name)) {
      if (!base::IsAtOrBelow(path, Dirname(share.path) + folder.asString())) continue;
      outer = share.name;
      depth = share.path.size();
    }
  }
  return outer;
}

/// First the folders, as long as the share can still be asked for; then what the engine and the daemons have of it; the
/// table last, so that the command can be repeated after a failure.
void RemoveShare(const std::string& name) {
  (void)OwnShare(name, "remove");
  const std::string queue_path = sdk::SDKShare(name).GetQueuePath();
  RequireEngine();
  const Json::Value folders = FoldersOf(name);
  const std::string outer = folders.empty() ? "" : OuterOf(sdk::SDKShare(name).GetPath());
  if (!folders.empty()) RequireIndexDaemon();
  if (!folders.empty()) ChangeConfiguration([&] { fileindex::FolderDelete(folders); });
  DropRemains(name, queue_path);
  kova::host::RemoveShare(name);
  (void)printf("share %s and its index are removed; its files were not touched%s%s\n", EscapeForTerminal(name).c_str(),
               outer.empty() ? "" : ", and are found in share ", EscapeForTerminal(outer).c_str());
}

/// True when the folder is that share already.
bool MakeWay(const kova::host::ShareEntry& entry, bool replace) {
  for (const auto& known : kova::host::ListShares()) {
    if (known.name != entry.name) continue;
    if (known.path == entry.path) return true;
    if (!replace) continue;
    const std::string problem = kova::host::ShareFolderProblem(entry);
    if (!problem.empty()) throw Failure(problem);
    RemoveShare(known.name);
  }
  return false;
}

/// Undoes what an add has done before it failed. @return whether nothing of it is left.
bool TakeBack(const std::string& name, bool added) try {
  const std::string queue_path = sdk::SDKShare(name).GetQueuePath();
  try {
    const Json::Value folders = FoldersOf(name);
    if (!folders.empty()) fileindex::FolderDelete(folders);
    DropRemains(name, queue_path);
    Unregister(queue_path);
  } catch (const std::exception&) {
    // What is left then is what a daemon that is away has of it.
  }
  if (!FoldersOf(name).empty()) return false;
  if (added) kova::host::RemoveShare(name);
  return true;
} catch (const std::exception&) {
  return false;
}

/// An add that fails leaves nothing.
void IndexWholeShare(const std::string& name, bool added) {
  const std::string path = "/" + name;
  Json::Value list(Json::arrayValue);
  list.append(fileindex::Folder(path, name, true, true, true, true, false, false).GetData());
  try {
    fileindex::FolderAdd(list, false);
  } catch (const Error& error) {
    const std::string left = TakeBack(name, added) ? (added ? "the share was not added" : "the share was not indexed")
                                                   : "'fileindexctl share remove " + name + "' undoes what was done";
    throw Failure(Explain(error, left));
  }
}

/// A file is in the deepest share alone.
void PrintNesting(const kova::host::ShareEntry& added) {
  const std::set<std::string> indexed = fileindex::FolderMgr().GetIndexedShares();
  if (indexed.count(added.name) == 0) return;
  for (const auto& share : kova::host::ListShares()) {
    if (indexed.count(share.name) == 0 || !base::IsBelow(share.path, added.path)) continue;
    (void)printf("share %s lies in it: its files are found in that share only\n",
                 EscapeForTerminal(share.name).c_str());
  }
  const std::string outer = OuterOf(added.path);
  if (outer.empty()) return;
  (void)printf("it lies in share %s, which leaves it out: its files are found in share %s only\n",
               EscapeForTerminal(outer).c_str(), EscapeForTerminal(added.name).c_str());
}

/// What the table of shares would refuse is refused here, too.
int PreviewShare(const Arguments& arguments, const kova::host::ShareEntry& entry) {
  std::string problem = kova::host::ShareTextProblem(entry.name, entry.path);
  if (problem.empty()) problem = kova::host::ShareFolderProblem(entry);
  if (!problem.empty()) throw Failure(problem);
  if (IsShare(entry.name)) {
    const std::string path = sdk::SDKShare(entry.name).GetPath();
    (void)fprintf(stderr, "there is a share %s already: %s\n", EscapeForTerminal(entry.name).c_str(),
                  EscapeForTerminal(path).c_str());
  }
  PreviewRequest request = {entry.path, entry.path, entry.path, Kinds(std::string("all")), RulesOf(entry.name), {}};
  request.rules.folders[entry.path];
  ShowPreview(std::move(request), arguments.Has("--json"));
  if (!arguments.Has("--json")) (void)printf("nothing was changed\n");
  return kDone;
}

}  // namespace

/// A share that is there already with the same folder is no failure: where nothing of it is indexed yet, all of it
/// is from now on.
int RunShareAdd(const Arguments& arguments) {
  kova::host::ShareEntry entry;
  entry.path = RealFolder(arguments.words[0]);
  entry.name = arguments.Get("--name", Basename(entry.path));
  if (IsDryRun(arguments)) return PreviewShare(arguments, entry);
  if (!arguments.Has("--no-index")) RequireEngine();
  const bool known = MakeWay(entry, arguments.Has("--replace"));
  if (!known) kova::host::AddShare(entry);
  const bool index = !arguments.Has("--no-index") && FoldersOf(entry.name).empty();
  if (index) IndexWholeShare(entry.name, !known);
  (void)printf("share %s: %s%s%s\n", EscapeForTerminal(entry.name).c_str(), EscapeForTerminal(entry.path).c_str(),
               known ? " (a share already)" : "", index ? ", all of it is indexed" : "");
  PrintNesting(entry);
  return kDone;
}

/// Those of the host's table and of the file-sharing service.
int RunShareList(const Arguments& arguments) {
  const auto shares = kova::host::ListShares();
  Json::Value list(Json::arrayValue);
  for (const auto& share : shares) {
    Json::Value entry;
    entry["name"] = share.name;
    entry["path"] = share.path;
    list.append(entry);
    if (!arguments.Has("--json")) {
      (void)printf("%-20s %s\n", EscapeForTerminal(share.name).c_str(), EscapeForTerminal(share.path).c_str());
    }
  }
  if (arguments.Has("--json")) PrintJson(list);
  if (shares.empty() && !arguments.Has("--json")) {
    (void)fprintf(stderr, "there are no shares; add one with 'fileindexctl share add FOLDER'\n");
  }
  return shares.empty() ? kNothingFound : kDone;
}

/// See RemoveShare, which 'share add --replace' uses, too.
int RunShareRemove(const Arguments& arguments) {
  RemoveShare(arguments.words[0]);
  return kDone;
}

}  // namespace ferrox::cli
