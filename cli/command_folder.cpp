#include <sys/stat.h>

#include <algorithm>
#include <cstdio>
#include <map>
#include <memory>
#include <optional>

#include <json/value.h>

#include "base/path.h"
#include "cli/ask.h"
#include "cli/command_table.h"
#include "cli/configuration_change.h"
#include "cli/escape.h"
#include "cli/excluded.h"
#include "cli/explain.h"
#include "cli/folder_exclusions.h"
#include "cli/folder_path.h"
#include "cli/format.h"
#include "cli/kinds.h"
#include "cli/output.h"
#include "cli/preview.h"
#include "cli/rights.h"
#include "common/file_util.h"
#include "common/paths.h"
#include "fileindex/folders/folder_mgr.h"
#include "fileindex/operations/index_mgr.h"
#include "fileindex/util.h"
#include "sdk/share.h"

/// The list of indexed folders: adding, changing, deleting and showing its entries. The library does it; here paths are
/// understood as people give them, entries that are there already keep what is not changed, and failures are explained.
namespace ferrox::cli {

namespace {

using fileindex::FolderMgr;

constexpr char kQueueFolder[] = "/var/lib/kova/fileindex/queue";

/// All of them before anything is changed: one that means no folder ends the command.
std::vector<std::string> SharePaths(const Arguments& arguments, const FolderMgr& configured) {
  std::vector<std::string> paths;
  for (const std::string& word : arguments.words) paths.push_back(ToSharePath(word, configured));
  return paths;
}

Json::Value ToArray(const std::vector<std::string>& paths) {
  Json::Value array(Json::arrayValue);
  for (const std::string& path : paths) array.append(path);
  return array;
}

/// The stored form of each folder: what is given, and of an entry that is there already the rest.
Json::Value FolderEntries(const Arguments& arguments, const std::vector<std::string>& paths,
                          const std::optional<Kinds>& kinds, const FolderMgr& configured) {
  if (arguments.Has("--name") && paths.size() != 1) throw UsageError("--name goes with one folder at a time");
  Json::Value list(Json::arrayValue);
  for (const std::string& path : paths) {
    const std::string name = arguments.Get("--name", Basename(path));
    Json::Value entry = fileindex::Folder(path, name, true, true, true, true, false, false).GetData();
    for (const auto& folder : configured.GetFolders()) {
      if (folder->GetPath() == path) entry = folder->GetData();
    }
    if (arguments.Has("--name")) entry["name"] = name;
    if (kinds.has_value()) kinds->Store(entry);
    list.append(entry);
  }
  return list;
}

/// The library takes any path that can be indexed; a file would be one.
void RequireNoFiles(const std::vector<std::string>& paths) {
  for (const std::string& path : paths) {
    struct stat status = {};
    const std::string full_path = fileindex::GetFullPath(path);
    if (lstat(full_path.c_str(), &status) == 0 && S_ISREG(status.st_mode)) {
      throw Failure(path + " is a file; give the folder that holds it");
    }
  }
}

/// The library refuses the same, in fewer words.
void RequireNew(const std::vector<std::string>& paths, const FolderMgr& configured) {
  for (const std::string& path : paths) {
    if (!configured.HasFolder(path)) continue;
    throw Failure(path + " is indexed already; 'fileindexctl folder set' changes its kinds (error " +
                  std::to_string(Error::kDuplicatedFolder) + ")");
  }
}

/// What the library would refuse is refused here, too. Folders that are indexed already keep their own kinds.
int PreviewFolders(const Arguments& arguments, const Kinds& kinds) {
  const FolderMgr configured;
  const std::vector<std::string> paths = SharePaths(arguments, configured);
  RequireNoFiles(paths);
  for (const std::string& path : paths) {
    if (!fileindex::CanPathBeIndexed(path)) throw Failure(path + " cannot be indexed: " + WhyNotIndexable(path));
    const std::string full_path = fileindex::GetFullPath(path);
    const std::string share = fileindex::GetShareNameByPath(path);
    PreviewRequest request = {path, sdk::SDKShare(share).GetPath(), full_path, kinds, RulesOf(share), {}};
    request.rules.folders[full_path] = PatternsAfter(arguments, path);
    for (const auto& folder : configured.GetFolders()) {
      if (base::IsBelow(folder->GetPath(), path)) request.others[folder->GetFullPath()] = "it is indexed already";
    }
    ShowPreview(std::move(request), arguments.Has("--json"));
    if (configured.IsFullPathIndexed(full_path)) {
      (void)fprintf(stderr, "%s lies in a folder that is indexed already: at most its kinds would change\n",
                    EscapeForTerminal(path).c_str());
    }
  }
  if (!arguments.Has("--json")) (void)printf("nothing was changed\n");
  return kDone;
}

/// Adds or changes folders with one call of the library, so that all of them are changed or none. The engine is asked
/// first, since the index of a new share is made before the folders file is saved.
int Upsert(const Arguments& arguments, const std::optional<Kinds>& kinds, void (*upsert)(const Json::Value&, bool)) {
  const FolderMgr configured;
  const std::vector<std::string> paths = SharePaths(arguments, configured);
  RequireNoFiles(paths);
  const Json::Value list = FolderEntries(arguments, paths, kinds, configured);
  RequireEngine();
  ChangeWithPatterns(arguments, paths, [&] { ChangeConfiguration([&] { upsert(list, false); }); });
  for (const Json::Value& entry : list) {
    (void)printf("%s: %s\n", EscapeForTerminal(TextOf(entry, "path")).c_str(), Kinds(entry).Text().c_str());
  }
  (void)printf("indexing has begun; 'fileindexctl status' shows how far it is\n");
  return kDone;
}

/// Two lines for people: the path, and below it the kinds, the name where it is another than the path's last part, the
/// pause, and the state where it was asked for.
std::string FolderText(const Json::Value& folder) {
  std::string text = EscapeForTerminal(TextOf(folder, "path")) + "\n    " + Kinds(folder).Text();
  const std::string name = TextOf(folder, "name");
  if (name != Basename(TextOf(folder, "path"))) text += ", \"" + EscapeForTerminal(name) + "\"";
  if (folder["paused"].asBool()) text += ", paused";
  const std::string volume = TextOf(folder, "volume_to_be_clean");
  if (!volume.empty() && folder["paused"].asBool()) text += " with the volume " + EscapeForTerminal(volume);
  if (!folder["additional"].isObject()) return text + "\n" + PatternText(folder);
  const Json::Value& status = folder["additional"]["status"];
  text += ", " + TextOf(status, "text");
  return text + (TextOf(status, "desc").empty() ? "" : " (" + TextOf(status, "desc") + ")") + "\n" +
         PatternText(folder);
}

/// The library leaves folders out of a page whose state it cannot find out. Here they stay, without it, and standard
/// error says why. True when there were none.
bool AddStates(Json::Value& folders, const Json::Value& with_states) {
  const FolderMgr configured;
  Json::ArrayIndex next = 0;
  for (Json::Value& folder : folders) {
    const std::string path = TextOf(folder, "path");
    if (next < with_states.size() && TextOf(with_states[next], "path") == path) {
      folder = with_states[next++];
      continue;
    }
    std::string reason = "try again";  // now it can be found out: something changed in between
    try {
      std::shared_ptr<fileindex::Folder> one;
      configured.Get(one, path);
      Json::Value state;
      one->GetStatus(state);
    } catch (const Error& error) {
      reason = Explain(error);
    }
    Warn(path + ": its state is not known: " + reason);
  }
  return next == folders.size();
}

}  // namespace

/// Refused for a folder that is in the list already (kDuplicatedFolder); the remedy names "folder set".
int RunFolderAdd(const Arguments& arguments) {
  const Kinds kinds(arguments.Get("--kinds", "all"));
  const FolderMgr configured;
  RequireNew(SharePaths(arguments, configured), configured);
  return IsDryRun(arguments) ? PreviewFolders(arguments, kinds) : Upsert(arguments, kinds, &fileindex::FolderAdd);
}

/// A change without --kinds would switch all kinds on, which is hardly meant: it is an option that is needed,
/// unless the patterns are changed.
int RunFolderSet(const Arguments& arguments) {
  std::optional<Kinds> kinds;
  if (arguments.Has("--kinds")) kinds.emplace(arguments.Get("--kinds"));
  return Upsert(arguments, kinds, &fileindex::FolderSet);
}

/// Both daemons are needed: without them the index or the worker of a share would stay behind.
int RunFolderDelete(const Arguments& arguments) {
  const std::vector<std::string> paths = SharePaths(arguments, FolderMgr());
  RequireEngine();
  RequireIndexDaemon();
  ChangeConfiguration([&] { fileindex::FolderDelete(ToArray(paths)); });
  for (const std::string& path : paths) {
    (void)printf("%s is no longer indexed; its files were not touched\n", EscapeForTerminal(path).c_str());
  }
  if (FolderMgr().GetFolders().empty()) (void)printf("no indexed folder is left: indexing has stopped\n");
  return kDone;
}

int RunFolderReindex(const Arguments& arguments) {
  const FolderMgr configured;
  const std::vector<std::string> paths = SharePaths(arguments, configured);
  for (const std::string& path : paths) {
    RequireIndexed(fileindex::GetShareNameByPath(path), configured);
    if (configured.IsFullPathIndexed(fileindex::GetFullPath(path))) continue;
    throw Failure(path + " lies in no indexed folder; 'fileindexctl folder list' shows them");
  }
  fileindex::FolderReindex(ToArray(paths));
  for (const std::string& path : paths) (void)MarkIfBusy(fileindex::GetShareNameByPath(path));
  for (const std::string& path : paths) {
    (void)printf("queued: %s will be compared with the index\n", EscapeForTerminal(path).c_str());
  }
  return kDone;
}

/// No daemon need run, and the share need not be there: an entry of the list stands for itself.
int RunFolderGet(const Arguments& arguments) {
  Json::Value folder;
  fileindex::FolderGet(folder, ToSharePath(arguments.words[0], FolderMgr()));
  Json::Value alone(Json::arrayValue);
  alone.append(folder);
  AddPatterns(alone);
  folder = alone[0];
  if (arguments.Has("--json")) {
    PrintJson(folder);
  } else {
    (void)printf("%s", FolderText(folder).c_str());
  }
  return kDone;
}

/// The page is read without states first: the library leaves a folder out of which it cannot tell the state, and here
/// it is shown nevertheless. Two readings may differ when somebody changes the list in between; AddStates goes by the
/// paths.
int RunFolderList(const Arguments& arguments) {
  constexpr long long kMost = fileindex::kFileIndexFoldersMax;
  const auto offset = static_cast<unsigned>(arguments.Number("--offset", 0, 0, kMost));
  const auto limit = static_cast<unsigned>(arguments.Number("--limit", kMost, 0, kMost));
  const auto list = [&](Json::Value& page, const Json::Value& additional) {
    fileindex::FolderList(page, offset, limit, arguments.Get("--sort"), arguments.Has("--desc") ? "desc" : "asc",
                          additional);
  };
  Json::Value page;
  list(page, Json::Value(Json::arrayValue));
  bool is_complete = true;
  if (arguments.Has("--status")) {
    RequireReadable(InstancePath(kQueueFolder));
    Json::Value with_states;
    Json::Value additional(Json::arrayValue);
    additional.append("status");
    list(with_states, additional);
    is_complete = AddStates(page["folder"], with_states["folder"]);
  }
  AddPatterns(page["folder"]);
  const bool none = UintOf(page, "total") == 0;
  const int done = is_complete ? kDone : kIncomplete;
  if (arguments.Has("--json")) {
    PrintJson(page);
    return none ? kNothingFound : done;
  }
  for (const Json::Value& folder : page["folder"]) (void)printf("%s", FolderText(folder).c_str());
  if (none) (void)fprintf(stderr, "no folder is indexed; choose one with 'fileindexctl folder add PATH'\n");
  const auto shown = static_cast<uint64_t>(page["folder"].size());
  if (!none && shown != UintOf(page, "total")) {
    (void)printf("%s of %s shown\n", Count(shown).c_str(), Count(UintOf(page, "total")).c_str());
  }
  return none ? kNothingFound : done;
}

}  // namespace ferrox::cli
