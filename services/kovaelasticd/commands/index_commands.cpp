// Commands on indices.
#include <limits>

#include "common/json_util.h"
#include "common/log.h"
#include "services/kovaelasticd/commands/commands.h"
#include "services/kovaelasticd/commands/members.h"

namespace ferrox::engine {

namespace {

/// The folder that the member `name` tells, without "/" at its end, so that one folder has one spelling.
std::string FolderPath(const char* name, const std::string& text) {
  std::string path = CheckedPath(name, text);
  while (path.size() > 1 && path.back() == '/') path.pop_back();
  return path;
}

/// "rebuilding" with time and reason, while the index is not complete.
void AddRebuilding(const RebuildState& state, Json::Value& result) {
  if (state.Since() == 0) return;
  result["rebuilding"]["since"] = Json::Int64(state.Since());
  result["rebuilding"]["reason"] = state.Reason();
}

/// "upgrading" with how far it is, and why it waits, until the index has the present format.
void AddUpgrading(Index& index, Json::Value& result) {
  const std::optional<UpgradeProgress> progress = index.Upgrading();
  if (!progress.has_value()) return;
  Json::Value& upgrading = result["upgrading"];
  upgrading["done"] = Json::Int64(progress->done);
  upgrading["of"] = Json::Int64(progress->of);
  if (!progress->problem.empty()) upgrading["problem"] = progress->problem;
}

Json::Value OnIndexCreate(CommandCall& call) {
  const std::string id = IndexId(call.data);
  const std::string path = FolderPath("path", RequiredText(call.data, "path"));
  for (const char* name : {"settings", "event_handler"}) {
    if (!IsJsonObject(call.data[name])) RefuseMember(name, "an object");
  }
  call.registry.Create(id, path, call.data["mappings"]);
  return {};
}

Json::Value OnIndexPause(CommandCall& call) {
  call.registry.Pause(IndexId(call.data));
  return {};
}

Json::Value OnIndexResume(CommandCall& call) {
  call.registry.Resume(IndexId(call.data));
  return {};
}

Json::Value OnIndexDelete(CommandCall& call) {
  call.registry.Delete(IndexId(call.data));
  return {};
}

Json::Value OnIndexRebuild(CommandCall& call) {
  call.registry.Rebuild(IndexId(call.data));
  return {};
}

Json::Value OnIndexRebuilt(CommandCall& call) {
  call.registry.EndRebuild(IndexId(call.data),
                           OptionalInt(call.data, "since", 0, 0, std::numeric_limits<int64_t>::max()));
  return {};
}

Json::Value OnIndexPrepared(CommandCall& call) {
  const Registry::OpenIndex open = call.registry.Open(IndexId(call.data));
  open.index->Write([](IndexStore& store) { store.EndPreparing(); });
  open.index->Commit();
  return {};
}

/// What the share's name may be is left to the index daemon; it must be one that a path can hold.
Json::Value OnIndexShare(CommandCall& call) {
  const std::string id = IndexId(call.data);
  ShareNote note;
  note.share = RequiredText(call.data, "share");
  if (note.share.empty() || note.share.find('/') != std::string::npos) RefuseMember("share", "the name of a share");
  note.root = FolderPath("root", RequiredText(call.data, "root"));
  note.refused = OptionalText(call.data, "refused").value_or("");
  if (!IsJsonObject(call.data["rules"])) RefuseMember("rules", "an object");
  note.rules = call.data["rules"];
  note.ReadNames();
  call.registry.NoteShare(id, std::move(note));
  return {};
}

Json::Value OnIndexConfigSet(CommandCall& call) {
  const std::string id = IndexId(call.data);
  const Json::Value& changes = RequiredObject(call.data, "data");
  std::string new_path = OptionalText(changes, "path").value_or("");
  if (!new_path.empty()) new_path = FolderPath("path", new_path);
  const std::optional<std::string> new_id = OptionalText(changes, "id");
  if (new_id.has_value()) (void)IndexId(changes);
  if (new_path.empty() && !new_id.has_value()) RefuseMember("data", "an object with \"id\" or \"path\" or both");
  call.registry.Move(id, new_id.value_or(""), new_path);
  return {};
}

/// With "figures", opens each index that is not paused to count its documents.
Json::Value OnIndexList(CommandCall& call) {
  Json::Value list(Json::arrayValue);
  const bool figures = OptionalBool(call.data, "figures", true);
  for (const Registry::Listed& listed : call.registry.List()) {
    Json::Value entry;
    entry["id"] = listed.id;
    entry["path"] = listed.path;
    entry["paused"] = listed.paused;
    AddRebuilding(listed.rebuild, entry);
    try {
      if (figures && !listed.paused) {
        const Registry::OpenIndex open = call.registry.Open(listed.id);
        entry["documents"] = Json::Int64(open.index->Stat().documents);
        AddUpgrading(*open.index, entry);
      }
    } catch (const Error& error) {
      entry["error"] = error.what();  // one unusable index does not hide the others
    }
    list.append(std::move(entry));
  }
  return list;
}

Json::Value OnIndexStat(CommandCall& call) {
  const Registry::OpenIndex open = call.registry.Open(IndexId(call.data));
  const StoreStat stat = open.index->Stat();
  Json::Value result;
  result["documents"] = Json::Int64(stat.documents);
  result["with_content"] = Json::Int64(stat.with_content);
  result["bytes_on_disk"] = Json::Int64(stat.bytes_on_disk);
  result["text_bytes"] = Json::Int64(stat.text_bytes);
  result["without_access"] = Json::Int64(stat.without_access);
  if (stat.preparing) result["preparing"] = true;
  if (stat.clearing > 0) result["clearing"] = Json::Int64(stat.clearing);
  result["uncommitted"] = Json::Int64(open.index->Uncommitted());
  AddRebuilding(open.rebuild, result);
  AddUpgrading(*open.index, result);
  result["extract_errors"] = Json::Value(Json::objectValue);
  for (const auto& [reason, count] : stat.extract_errors) result["extract_errors"][reason] = Json::Int64(count);
  result["extract_error_examples"] = Json::Value(Json::objectValue);
  for (const auto& [reason, paths] : stat.extract_error_examples) {
    result["extract_error_examples"][reason] = Vec2JsonArr(paths);
  }
  return result;
}

constexpr Command kIndexCommands[] = {{"index_create", &OnIndexCreate, Users::kPrivileged},
                                      {"index_pause", &OnIndexPause, Users::kPrivileged},
                                      {"index_resume", &OnIndexResume, Users::kPrivileged},
                                      {"index_delete", &OnIndexDelete, Users::kPrivileged},
                                      {"index_rebuild", &OnIndexRebuild, Users::kPrivileged},
                                      {"index_rebuilt", &OnIndexRebuilt, Users::kPrivileged},
                                      {"index_share", &OnIndexShare, Users::kPrivileged},
                                      {"index_prepared", &OnIndexPrepared, Users::kPrivileged},
                                      {"index_config_set", &OnIndexConfigSet, Users::kPrivileged},
                                      {"index_list", &OnIndexList, Users::kPrivileged},
                                      {"index_stat", &OnIndexStat, Users::kPrivileged}};

}  // namespace

std::span<const Command> IndexCommands() { return kIndexCommands; }

}  // namespace ferrox::engine
