#define FERROX_SOURCE "elastic_control"
#include "fileindex/elastic/requests.h"

#include "common/file_util.h"
#include "common/json_util.h"
#include "fileindex/elastic/elastic_control.h"
#include "wire/fields.h"

namespace ferrox::fileindex::elastic {

namespace {

Json::Value Object(const char* key, const Json::Value& value) {
  Json::Value object(Json::objectValue);
  object[key] = value;
  return object;
}

/// What lies below `dir`, not `dir` itself: hence the slash.
Json::Value BelowQuery(const std::string& dir) { return Object("prefix", Object(kKOVAMDPath, dir + "/")); }

Json::Value Compound() { return Object("compound", Json::Value(Json::arrayValue)); }

}  // namespace

Json::Value IndexRequest(const char* command, const std::string& index_id) {
  Json::Value request = Object("command", command);
  request["data"]["id"] = index_id;
  return request;
}

Json::Value CreateRequest(const std::string& index_id, const std::string& db_path) {
  Json::Value request = IndexRequest("index_create", index_id);
  Json::Value& data = request["data"];
  data["path"] = db_path;
  data["settings"] = GetFileIndexSettings();
  data["mappings"] = GetFileIndexMappings();
  data["event_handler"] = GetFileIndexEventHandler();
  return request;
}

Json::Value ConfigRequest(const std::string& index_id, const std::string& new_id, const std::string& db_path) {
  Json::Value request = IndexRequest("index_config_set", index_id);
  Json::Value& settings = request["data"]["data"];
  if (!new_id.empty()) settings["id"] = new_id;
  settings["path"] = db_path;
  return request;
}

Json::Value DocumentRequest(const char* command, const std::string& index_id, const std::string& path) {
  Json::Value request = IndexRequest(command, index_id);
  request["data"]["doc_id"] = path;
  return request;
}

Json::Value UpsertRequest(const std::string& index_id, const std::string& path, const Json::Value& document) {
  Json::Value request = DocumentRequest("document_upsert_by_id", index_id, path);
  request["data"]["data"] = document;
  return request;
}

Json::Value SetRequest(const std::string& index_id, const Json::Value& doc_id, const Json::Value& document) {
  Json::Value request = IndexRequest("document_set_by_id", index_id);
  request["data"]["doc_id"] = doc_id;
  request["data"]["data"] = document;
  return request;
}

Json::Value DeleteBelowRequest(const std::string& index_id, const std::string& dir) {
  Json::Value request = IndexRequest("document_del_by_query", index_id);
  request["data"]["query"]["qsl"] = BelowQuery(dir);
  return request;
}

Json::Value QueryBelowRequest(const std::string& index_id, const std::string& dir,
                              const std::vector<std::string>& load_fields) {
  Json::Value request = IndexRequest("document_get_by_query", index_id);
  Json::Value& query = request["data"]["query"];
  query["qsl"] = BelowQuery(dir);
  query["load_field"] = Vec2JsonArr(load_fields);
  return request;
}

Json::Value MovedDocument(const std::string& new_path) {
  const std::string name = Basename(new_path);
  const std::string extension = GetFileExtension(new_path, true);
  Json::Value document(Json::objectValue);
  document[kKOVAMDPath] = new_path;
  document[kKOVAMDParent] = Dirname(new_path);
  for (const char* field : {kKOVAMDFSName, kKOVAMDSearchFileName, kKOVAMDDisplayName}) document[field] = name;
  for (const char* field : {kKOVAMDKind, kKOVAMDExtension}) document[field] = extension;
  return document;
}

Json::Value MoveBelowRequest(const std::string& index_id, const std::string& new_path, const std::string& old_path,
                             const Json::Value& below) {
  Json::Value request = Compound();
  for (const Json::Value& entry : below) {
    std::string name;
    std::string parent;
    GetJsonValue(name, entry, kKOVAMDFSName, true);
    GetJsonValue(parent, entry, kKOVAMDParent, true);
    // Deliberate: by position, whatever the parent begins with; one that is shorter is replaced whole.
    parent.replace(0, old_path.size(), new_path);
    Json::Value document(Json::objectValue);
    document[kKOVAMDPath] = parent + "/" + name;
    document[kKOVAMDParent] = parent;
    document[kKOVAMDSearchFileName] = name;
    request["compound"].append(SetRequest(index_id, entry.get(kKOVAMDPath, Json::Value()), document));
  }
  return request;
}

Json::Value TermSuggestionRequest(const std::string& db_name, const std::vector<std::string>& fields) {
  Json::Value request = Compound();
  for (const std::string& field : fields) {
    Json::Value part = Object("command", "update_term_suggestion");
    part["data"]["doc_id_field"] = field;
    part["data"]["db_name"] = db_name;
    request["compound"].append(part);
  }
  return request;
}

}  // namespace ferrox::fileindex::elastic
