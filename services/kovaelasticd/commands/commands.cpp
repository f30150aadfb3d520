#include "services/kovaelasticd/commands/commands.h"

#include <unistd.h>

#include <algorithm>

#include "base/path.h"
#include "common/json_util.h"
#include "common/log.h"

namespace ferrox::engine {

namespace {

// What is refused as no id or path, rather than found out by the file system.
constexpr size_t kIdMaxBytes = 512;
constexpr size_t kPathMaxBytes = 8192;
/// A longer list of documents is to be asked for in pages.
constexpr int64_t kListMaxBytes = 128 << 20;
constexpr int64_t kMaxInt = std::numeric_limits<int64_t>::max();

std::string IndexId(const Json::Value& data) {
  const std::string id = RequiredText(data, "id");
  if (id.empty() || id.size() > kIdMaxBytes) RefuseMember("id", "an index id of 1 to 512 bytes");
  return id;
}

/// An index's folder, without "/" at its end, so that one folder has one spelling.
std::string FolderPath(const std::string& text) {
  std::string path = CheckedPath("path", text);
  while (path.size() > 1 && path.back() == '/') path.pop_back();
  return path;
}

Json::Value OnIndexCreate(CommandCall& call) {
  const std::string id = IndexId(call.data);
  const std::string path = FolderPath(RequiredText(call.data, "path"));
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
  call.registry.EndRebuild(IndexId(call.data), OptionalInt(call.data, "since", 0, 0, kMaxInt));
  return {};
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

Json::Value OnIndexConfigSet(CommandCall& call) {
  const std::string id = IndexId(call.data);
  const Json::Value& changes = RequiredObject(call.data, "data");
  std::string new_path = OptionalText(changes, "path").value_or("");
  if (!new_path.empty()) new_path = FolderPath(new_path);
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

/// Any command that changes documents, on its own.
template <const char* const& kName>
Json::Value OnDocumentChange(CommandCall& call) {
  const Registry::OpenIndex open = call.registry.Open(IndexId(call.data));
  const DocumentChange change = ReadDocumentChange(kName, open, call.data);
  open.index->Write([&change](IndexStore& store) { Apply(store, change); });
  return {};
}

/// The documents that "query" asks for: {"qsl": {CONDITION}}, with exactly one condition.
GetRequest ReadQuery(const Json::Value& query) {
  GetRequest request;
  const Json::Value& qsl = RequiredObject(query, "qsl");
  const auto is_true = [&qsl](const char* name) { return qsl[name].isBool() && qsl[name].asBool() && qsl.size() == 1; };
  request.suspects = is_true("suspects");
  request.unread = is_true("unread");
  if (request.suspects || request.unread) return request;
  if (qsl["file"].isUInt64() && qsl.size() == 1) request.file = qsl["file"].asUInt64();
  if (request.file != 0) return request;
  const Json::Value& prefix = qsl["prefix"];
  const Json::Value& term = qsl["term"];
  const bool one = prefix.isNull() != term.isNull() && qsl.size() == 1;
  const Json::Value& condition = prefix.isNull() ? term : prefix;
  if (!one || !condition.isObject() || condition.size() != 1 || !condition[field::kPath].isString()) {
    RefuseMember("qsl", R"({"prefix": {"KOVAMDPath": ...}} or {"term": {"KOVAMDPath": ...}})");
  }
  (prefix.isNull() ? request.term : request.prefix) = CheckedPath(field::kPath, condition[field::kPath].asString());
  return request;
}

/// Runs on the index's thread and so sees changes that are not committed yet, unlike a search.
Json::Value OnGetByQuery(CommandCall& call) {
  const Registry::OpenIndex open = call.registry.Open(IndexId(call.data));
  const Json::Value& query = RequiredObject(call.data, "query");
  GetRequest request = ReadQuery(query);
  const Json::Value& fields = query["load_field"];
  if (!IsJsonArray(fields)) RefuseMember("load_field", "an array of field names");
  for (const Json::Value& name : fields) {
    if (!name.isString()) RefuseMember("load_field", "an array of field names");
    request.fields.push_back(name.asString());
  }
  request.after = OptionalText(query, "after").value_or("");
  request.limit = OptionalInt(query, "limit", -1, -1, kMaxInt);
  Json::Value list(Json::arrayValue);
  open.index->Read([&](IndexStore& store) {
    int64_t bytes = 0;
    store.Get(request, [&](const Json::Value& entry) {
      for (const Json::Value& member : entry) bytes += member.isString() ? 32 + int64_t(member.asString().size()) : 32;
      if (bytes > kListMaxBytes) {
        throw Error(Error::kEngineBadRequest,
                    "the list is too long for one reply; ask for it in pages, with \"limit\" and \"after\"");
      }
      list.append(entry);
    });
  });
  return list;
}

Json::Value OnCommit(CommandCall& call) {
  call.registry.Open(IndexId(call.data)).index->Commit();
  return {};
}

Json::Value OnUpdateTermSuggestion(CommandCall& call) {
  (void)RequiredText(call.data, "doc_id_field");
  const Registry::OpenIndex open = call.registry.Open(RequiredText(call.data, "db_name"));
  open.index->Write([](IndexStore& store) { store.RebuildSuggestions(); });
  return {};
}

Json::Value OnPing(CommandCall& /*call*/) {
  Json::Value result;
  result["version"] = kVersion;
  result["pid"] = getpid();
  return result;
}

constexpr const char* kUpsert = "document_upsert_by_id";
constexpr const char* kSet = "document_set_by_id";
constexpr const char* kMoveFolder = "folder_move";
constexpr const char* kDelete = "document_del_by_id";
constexpr const char* kDeleteQuery = "document_del_by_query";

constexpr Command kCommands[] = {{"index_create", &OnIndexCreate, false},
                                 {"index_pause", &OnIndexPause, false},
                                 {"index_resume", &OnIndexResume, false},
                                 {"index_delete", &OnIndexDelete, false},
                                 {"index_rebuild", &OnIndexRebuild, false},
                                 {"index_rebuilt", &OnIndexRebuilt, false},
                                 {"index_config_set", &OnIndexConfigSet, false},
                                 {"index_list", &OnIndexList, false},
                                 {"index_stat", &OnIndexStat, false},
                                 {kUpsert, &OnDocumentChange<kUpsert>, false},
                                 {kSet, &OnDocumentChange<kSet>, false},
                                 {kMoveFolder, &OnDocumentChange<kMoveFolder>, false},
                                 {kDelete, &OnDocumentChange<kDelete>, false},
                                 {kDeleteQuery, &OnDocumentChange<kDeleteQuery>, false},
                                 {"access_set", &RunAccessSet, false},
                                 {"document_get_by_query", &OnGetByQuery, false},
                                 {"commit", &OnCommit, false},
                                 {"update_term_suggestion", &OnUpdateTermSuggestion, false},
                                 {"search", &RunSearch, false},
                                 {"ping", &OnPing, true}};

}  // namespace

const Command* FindCommand(const std::string& name) {
  for (const Command& command : kCommands) {
    if (name == command.name) return &command;
  }
  return nullptr;
}

bool IsDocumentChange(const std::string& command) {
  return command == kUpsert || command == kSet || command == kMoveFolder || command == kDelete ||
         command == kDeleteQuery;
}

DocumentChange ReadDocumentChange(const std::string& command, const Registry::OpenIndex& index, Json::Value& data) {
  if (command == kDeleteQuery) {
    const GetRequest request = ReadQuery(RequiredObject(data, "query"));
    const bool one = !request.term.empty();
    return {one ? DocumentChange::Type::kDelete : DocumentChange::Type::kDeletePrefix,
            one ? request.term : request.prefix};
  }
  const std::string path = CheckedPath("doc_id", RequiredText(data, "doc_id"));
  if (command == kDelete) return {DocumentChange::Type::kDelete, path};
  (void)RequiredObject(data, "data");
  Json::Value& document = data["data"];
  index.schema->Check(document);
  const Json::Value& stored_path = document[field::kPath];
  if (command == kMoveFolder) {
    const std::string new_path = CheckedPath(field::kPath, RequiredText(document, field::kPath));
    if (base::IsAtOrBelow(new_path, path) || base::IsAtOrBelow(path, new_path))
      RefuseMember(field::kPath, "a path that is neither the folder's nor above nor below it");
    return {DocumentChange::Type::kMoveFolder, path, &document, OptionalText(data, "stamp").value_or("")};
  }
  if (command == kSet) {
    // A new path moves the document; null is no path.
    if (stored_path.isString()) {
      (void)CheckedPath(field::kPath, stored_path.asString());
    } else if (document.isMember(field::kPath) && !stored_path.isNull()) {
      RefuseMember(field::kPath, "a text");
    } else {
      document.removeMember(field::kPath);  // a document keeps its path
    }
    return {DocumentChange::Type::kSet, path, &document};
  }
  if (stored_path.isNull()) document[field::kPath] = path;
  if (!stored_path.isString() || stored_path.asString() != path) {
    RefuseMember(field::kPath, "the same as \"doc_id\"; set it with document_set_by_id to move a document");
  }
  return {DocumentChange::Type::kUpsert, path, &document};
}

void Apply(IndexStore& store, const DocumentChange& change) {
  switch (change.type) {
    case DocumentChange::Type::kUpsert:
      return store.Upsert(change.path, *change.data);
    case DocumentChange::Type::kSet:
      return store.Set(change.path, *change.data);
    case DocumentChange::Type::kMoveFolder:
      return store.MoveFolder(change.path, change.stamp, *change.data);
    case DocumentChange::Type::kDelete:
      return store.Delete(change.path);
    case DocumentChange::Type::kDeletePrefix:
      return store.DeletePrefix(change.path);
  }
}

void RefuseMember(const char* name, const std::string& must_be) {
  throw Error(Error::kEngineBadRequest, "\"" + std::string(name) + "\" must be " + must_be);
}

std::string CheckedPath(const char* name, const std::string& path) {
  const bool usable =
      !path.empty() && path.front() == '/' && path.size() <= kPathMaxBytes && path.find('\0') == std::string::npos;
  if (!usable) RefuseMember(name, "an absolute path of at most 8192 bytes");
  return path;
}

std::string RequiredText(const Json::Value& data, const char* name) {
  if (!data.isObject() || !data[name].isString()) RefuseMember(name, "given as a text");
  return data[name].asString();
}

std::optional<std::string> OptionalText(const Json::Value& data, const char* name) {
  const Json::Value& member = data[name];
  if (member.isNull()) return std::nullopt;
  if (!member.isString()) RefuseMember(name, "a text");
  return member.asString();
}

const Json::Value& RequiredObject(const Json::Value& data, const char* name) {
  const Json::Value& member = data[name];
  if (!member.isObject()) RefuseMember(name, "given as an object");
  return member;
}

int64_t OptionalInt(const Json::Value& data, const char* name, int64_t otherwise, int64_t low, int64_t high) {
  const Json::Value& member = data[name];
  if (member.isNull()) return otherwise;
  if (!member.isInt64() || member.asInt64() < low || member.asInt64() > high) {
    RefuseMember(name, "a whole number from " + std::to_string(low) + " to " + std::to_string(high));
  }
  return member.asInt64();
}

bool OptionalBool(const Json::Value& data, const char* name, bool otherwise) {
  const Json::Value& member = data[name];
  if (member.isNull()) return otherwise;
  if (!member.isBool()) RefuseMember(name, "true or false");
  return member.asBool();
}

}  // namespace ferrox::engine
