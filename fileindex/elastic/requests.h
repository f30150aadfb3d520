#pragma once

#include <string>
#include <vector>

#include <json/value.h>

/// The requests to the search engine, as values (docs/formats/engine.md). Nothing here sends or reads anything.
namespace ferrox::fileindex::elastic {

/// {"command": command, "data": {"id": index_id}}
Json::Value IndexRequest(const char* command, const std::string& index_id);
Json::Value CreateRequest(const std::string& index_id, const std::string& db_path);
/// Changes an index's settings: its place and, unless `new_id` is empty, its id.
Json::Value ConfigRequest(const std::string& index_id, const std::string& new_id, const std::string& db_path);

/// {"command": command, "data": {"id": index_id, "doc_id": path}}
Json::Value DocumentRequest(const char* command, const std::string& index_id, const std::string& path);
Json::Value UpsertRequest(const std::string& index_id, const std::string& path, const Json::Value& document);
Json::Value SetRequest(const std::string& index_id, const Json::Value& doc_id, const Json::Value& document);
Json::Value DeleteBelowRequest(const std::string& index_id, const std::string& dir);
/// All documents below `dir`, each with the named fields.
Json::Value QueryBelowRequest(const std::string& index_id, const std::string& dir,
                              const std::vector<std::string>& load_fields);

/// What changes in the document of an entry that moves to `new_path`.
Json::Value MovedDocument(const std::string& new_path);
/// One compound that moves the documents `below` (results of QueryBelowRequest for `old_path`) along with their folder.
/// @throws Error kBadArgument when one lacks its name or parent.
Json::Value MoveBelowRequest(const std::string& index_id, const std::string& new_path, const std::string& old_path,
                             const Json::Value& below);
Json::Value TermSuggestionRequest(const std::string& db_name, const std::vector<std::string>& fields);

}  // namespace ferrox::fileindex::elastic
