// Commands that change documents, and the one that lists them.
#include <limits>
#include <utility>

#include "base/path.h"
#include "common/json_util.h"
#include "services/kovaelasticd/commands/commands.h"
#include "services/kovaelasticd/commands/members.h"

namespace ferrox::engine {

namespace {

/// A longer list of documents is to be asked for in pages.
constexpr int64_t kListMaxBytes = 128 << 20;

/// What may be deleted by a query.
constexpr char kByPath[] = R"({"prefix": {"KOVAMDPath": ...}} or {"term": {"KOVAMDPath": ...}})";

constexpr const char* kUpsert = "document_upsert_by_id";
constexpr const char* kSet = "document_set_by_id";
constexpr const char* kMoveFolder = "folder_move";
constexpr const char* kDelete = "document_del_by_id";
constexpr const char* kDeleteQuery = "document_del_by_query";

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
  if (one && term.isObject() && term.size() == 1 && term[field::kParent].isString()) {
    request.folder = CheckedPath(field::kParent, term[field::kParent].asString());
    if (request.folder != "/") request.folder += '/';
    return request;
  }
  if (!one || !condition.isObject() || condition.size() != 1 || !condition[field::kPath].isString()) {
    RefuseMember("qsl", kByPath);
  }
  (prefix.isNull() ? request.term : request.prefix) = CheckedPath(field::kPath, condition[field::kPath].asString());
  return request;
}

/// What a member of a listed document takes in the reply, roughly.
int64_t BytesOf(const Json::Value& member) {
  constexpr int64_t kOthers = 32;
  const char* begin = nullptr;
  const char* end = nullptr;
  return member.isString() && member.getString(&begin, &end) ? kOthers + (end - begin) : kOthers;
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
  request.limit = OptionalInt(query, "limit", -1, -1, std::numeric_limits<int64_t>::max());
  Json::Value list(Json::arrayValue);
  open.index->Read([&](IndexStore& store) {
    int64_t bytes = 0;
    store.Get(request, [&](Json::Value entry) {
      for (const Json::Value& member : entry) bytes += BytesOf(member);
      if (bytes > kListMaxBytes) {
        throw Error(Error::kEngineBadRequest,
                    "the list is too long for one reply; ask for it in pages, with \"limit\" and \"after\"");
      }
      list.append(std::move(entry));
    });
  });
  return list;
}

/// Any command that changes documents, on its own.
template <const char* const& kName>
Json::Value OnDocumentChange(CommandCall& call) {
  const Registry::OpenIndex open = call.registry.Open(IndexId(call.data));
  const DocumentChange change = ReadDocumentChange(kName, open, call.data);
  open.index->Write([&change](IndexStore& store) { Apply(store, change); });
  return {};
}

constexpr Command kDocumentCommands[] = {{kUpsert, &OnDocumentChange<kUpsert>, Users::kPrivileged},
                                         {kSet, &OnDocumentChange<kSet>, Users::kPrivileged},
                                         {kMoveFolder, &OnDocumentChange<kMoveFolder>, Users::kPrivileged},
                                         {kDelete, &OnDocumentChange<kDelete>, Users::kPrivileged},
                                         {kDeleteQuery, &OnDocumentChange<kDeleteQuery>, Users::kPrivileged},
                                         {"document_get_by_query", &OnGetByQuery, Users::kPrivileged}};

}  // namespace

std::span<const Command> DocumentCommands() { return kDocumentCommands; }

bool IsDocumentChange(const std::string& command) {
  return command == kUpsert || command == kSet || command == kMoveFolder || command == kDelete ||
         command == kDeleteQuery;
}

DocumentChange ReadDocumentChange(const std::string& command, const Registry::OpenIndex& index, Json::Value& data) {
  if (command == kDeleteQuery) {
    const GetRequest request = ReadQuery(RequiredObject(data, "query"));
    const bool one = !request.term.empty();
    if (!one && request.prefix.empty()) RefuseMember("qsl", kByPath);
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

}  // namespace ferrox::engine
