#include "wire/engine_requests.h"

#include <utility>

#include "wire/fields.h"

namespace ferrox::wire {

namespace {

namespace field = fileindex::elastic;

// Members of an object are written in the order of the alphabet, whatever the order in which they are set here: the
// same request is the same text.

/// An object with one member.
Json::Value Object(const char* key, Json::Value value) {
  Json::Value object(Json::objectValue);
  object[key] = std::move(value);
  return object;
}

/// A command on one document.
Json::Value DocumentRequest(const char* command, const std::string& index_id, const Json::Value& doc_id) {
  Json::Value request = IndexRequest(command, index_id);
  request["data"]["doc_id"] = doc_id;
  return request;
}

}  // namespace

Json::Value EngineRequest(const char* command, Json::Value data) {
  Json::Value request = Object("command", command);
  request["data"] = std::move(data);
  return request;
}

Json::Value IndexRequest(const char* command, const std::string& index_id) {
  return EngineRequest(command, Object("id", index_id));
}

Json::Value CreateIndexRequest(const std::string& index_id, const std::string& db_path, Json::Value settings,
                               Json::Value mappings, Json::Value event_handler) {
  Json::Value request = IndexRequest("index_create", index_id);
  Json::Value& data = request["data"];
  data["path"] = db_path;
  data["settings"] = std::move(settings);
  data["mappings"] = std::move(mappings);
  data["event_handler"] = std::move(event_handler);
  return request;
}

/// What is to change has an object of its own, so that a new id is not taken for that of the index.
Json::Value ConfigureIndexRequest(const std::string& index_id, const std::string& new_id, const std::string& db_path) {
  Json::Value request = IndexRequest("index_config_set", index_id);
  Json::Value& changes = request["data"]["data"];
  if (!new_id.empty()) changes["id"] = new_id;
  changes["path"] = db_path;
  return request;
}

Json::Value IndexRebuiltRequest(const std::string& index_id, int64_t since) {
  Json::Value request = IndexRequest("index_rebuilt", index_id);
  request["data"]["since"] = Json::Int64(since);
  return request;
}

Json::Value IndexShareRequest(const std::string& index_id, IndexShare share) {
  Json::Value request = IndexRequest("index_share", index_id);
  Json::Value& data = request["data"];
  data["share"] = share.share;
  data["root"] = share.root;
  if (!share.refused.empty()) data["refused"] = share.refused;
  if (!share.rules.isNull()) data["rules"] = std::move(share.rules);
  return request;
}

/// "figures" is true unless it is given.
Json::Value ListIndicesRequest(bool figures) {
  return figures ? EngineRequest("index_list") : EngineRequest("index_list", Object("figures", false));
}

Json::Value UpsertDocumentRequest(const std::string& index_id, const std::string& path, Json::Value document) {
  Json::Value request = DocumentRequest("document_upsert_by_id", index_id, path);
  request["data"]["data"] = std::move(document);
  return request;
}

Json::Value SetDocumentRequest(const std::string& index_id, const Json::Value& doc_id, Json::Value members) {
  Json::Value request = DocumentRequest("document_set_by_id", index_id, doc_id);
  request["data"]["data"] = std::move(members);
  return request;
}

Json::Value MoveFolderRequest(const std::string& index_id, const std::string& path, const std::string& stamp,
                              Json::Value members) {
  Json::Value request = DocumentRequest("folder_move", index_id, path);
  if (!stamp.empty()) request["data"]["stamp"] = stamp;
  request["data"]["data"] = std::move(members);
  return request;
}

Json::Value AccessSetRequest(const std::string& index_id, const std::vector<SeenAccess>& records) {
  Json::Value request = IndexRequest("access_set", index_id);
  Json::Value& sent = request["data"]["records"] = Json::Value(Json::arrayValue);
  for (const SeenAccess& record : records) {
    Json::Value& entry = sent.append(Json::Value(Json::objectValue));
    entry["path"] = record.path;
    entry["stamp"] = record.stamp;
    entry["access"] = record.access;
  }
  return request;
}

Json::Value DeleteDocumentRequest(const std::string& index_id, const std::string& path) {
  return DocumentRequest("document_del_by_id", index_id, path);
}

/// The slash keeps out the folder itself, and its neighbours whose names begin with its own.
Json::Value AllBelow(const std::string& folder) { return Object("prefix", Object(field::kKOVAMDPath, folder + "/")); }

Json::Value DirectlyIn(const std::string& folder) { return Object("term", Object(field::kKOVAMDParent, folder)); }

Json::Value OnlyAt(const std::string& path) { return Object("term", Object(field::kKOVAMDPath, path)); }

Json::Value Unread() { return Object("unread", true); }

Json::Value OfFileNumber(uint64_t file) { return Object("file", Json::UInt64(file)); }

Json::Value Suspects() { return Object("suspects", true); }

Json::Value DeleteDocumentsRequest(const std::string& index_id, Json::Value which) {
  Json::Value request = IndexRequest("document_del_by_query", index_id);
  request["data"]["query"]["qsl"] = std::move(which);
  return request;
}

/// What has its default is left out: the engine's defaults are those of DocumentQuery.
Json::Value FindDocumentsRequest(const std::string& index_id, DocumentQuery query) {
  Json::Value request = IndexRequest("document_get_by_query", index_id);
  Json::Value& sent = request["data"]["query"];
  sent["qsl"] = std::move(query.which);
  for (const std::string& name : query.fields) sent["load_field"].append(name);
  if (query.limit > 0) sent["limit"] = query.limit;
  if (!query.after.empty()) sent["after"] = query.after;
  return request;
}

Json::Value FolderDigestsRequest(const std::string& index_id, const std::string& path, const std::string& after,
                                 uint64_t seed) {
  Json::Value request = IndexRequest("folder_digests", index_id);
  Json::Value& data = request["data"];
  data["path"] = path;
  if (!after.empty()) data["after"] = after;
  data["seed"] = Json::UInt64(seed);
  return request;
}

Json::Value TermSuggestionRequest(const std::string& db_name, const std::string& field) {
  Json::Value request = EngineRequest("update_term_suggestion");
  request["data"]["doc_id_field"] = field;
  request["data"]["db_name"] = db_name;
  return request;
}

Json::Value CompoundRequest(std::vector<Json::Value> parts) {
  Json::Value request = Object("compound", Json::Value(Json::arrayValue));
  for (Json::Value& part : parts) request["compound"].append(std::move(part));
  return request;
}

}  // namespace ferrox::wire
