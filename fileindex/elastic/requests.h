#pragma once

#include <string>
#include <vector>

#include <json/value.h>

/// The requests to the search engine, as values (docs/formats/engine.md), one function for each shape of request.
/// Nothing here sends or reads anything, so that tests compare requests without an engine. `index_id` is the id of an
/// index (GetFileIndexID); the id of a document is the full path of its file.
namespace ferrox::fileindex::elastic {

/// {"command": command, "data": {"id": index_id}}
Json::Value IndexRequest(const char* command, const std::string& index_id);
/// A new index in the folder `db_path`, with the schema of GetFileIndexMappings.
Json::Value CreateRequest(const std::string& index_id, const std::string& db_path);
/// Changes an index's settings: its place and, unless `new_id` is empty, its id.
Json::Value ConfigRequest(const std::string& index_id, const std::string& new_id, const std::string& db_path);

/// {"command": command, "data": {"id": index_id, "doc_id": path}}
Json::Value DocumentRequest(const char* command, const std::string& index_id, const std::string& path);
/// Stores a whole document, or replaces it.
Json::Value UpsertRequest(const std::string& index_id, const std::string& path, const Json::Value& document);
/// Changes the members of a stored document that `document` has; null removes one, the others stay. A new path moves
/// the document.
Json::Value SetRequest(const std::string& index_id, const Json::Value& doc_id, const Json::Value& document);
/// Deletes all documents below `dir`, not the one of `dir` itself.
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
/// One compound that has the words collected anew that a search suggests when it finds nothing.
Json::Value TermSuggestionRequest(const std::string& db_name, const std::vector<std::string>& fields);

}  // namespace ferrox::fileindex::elastic
