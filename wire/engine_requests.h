#pragma once

#include <cstdint>
#include <string>
#include <vector>

#include <json/value.h>

/// The requests to the search engine, as values; docs/formats/engine.md says what each asks for and what comes back.
/// The library, the index daemon and the tool build theirs here and nowhere else. Nothing here sends, checks or fails.
///
/// An index is named by its id (elastic::GetFileIndexID), a document by its own: the full path of its file.
namespace ferrox::wire {

/// {"command": command, "data": data}: the form of all that follow.
Json::Value EngineRequest(const char* command, Json::Value data = Json::Value(Json::objectValue));

// Indices.

/// A command on one index that takes nothing but its id: "index_pause", "index_stat", "commit" and others.
Json::Value IndexRequest(const char* command, const std::string& index_id);
/// `db_path` is the folder of the index's files; the rest is the schema (elastic_control.h).
Json::Value CreateIndexRequest(const std::string& index_id, const std::string& db_path, Json::Value settings,
                               Json::Value mappings, Json::Value event_handler);
/// Moves an index's files to `db_path` and, unless `new_id` is "", gives it that id.
Json::Value ConfigureIndexRequest(const std::string& index_id, const std::string& new_id, const std::string& db_path);
/// Says that what the rebuilding `since` was to fill is filled; `since` tells it from other rebuildings.
Json::Value IndexRebuiltRequest(const std::string& index_id, int64_t since);
/// Says which share the index is of, so that ordinary users can search it.
struct IndexShare {
  std::string share;         ///< its name
  std::string root;          ///< its folder
  std::string refused = {};  ///< why ordinary users may not search it; "": they may
  Json::Value rules = {};    ///< an object; null: none are known

  bool operator==(const IndexShare& other) const = default;
};
Json::Value IndexShareRequest(const std::string& index_id, IndexShare share);
/// All indices; with their figures, for which the engine opens each, or without.
Json::Value ListIndicesRequest(bool figures);

// Single documents.

/// Stores a whole document, or replaces it.
Json::Value UpsertDocumentRequest(const std::string& index_id, const std::string& path, Json::Value document);
/// Changes the members of a stored document that `members` has; null removes one, the others stay. A new KOVAMDPath
/// moves the document. `doc_id` is its path, as a value: it may come from a reply as it was.
Json::Value SetDocumentRequest(const std::string& index_id, const Json::Value& doc_id, Json::Value members);
/// The same for a folder's document, whose new KOVAMDPath `members` has: all documents below it move along. Refused
/// when its "_KOVAStamp" is not `stamp`; "": it may be any.
Json::Value MoveFolderRequest(const std::string& index_id, const std::string& path, const std::string& stamp,
                              Json::Value members);
/// What was seen of a file at `path`: its "_KOVAStamp" and "_KOVAAccess".
struct SeenAccess {
  std::string path;
  std::string stamp;
  std::string access;
};
/// Sets the rights of documents, without a look at anything else of theirs where the stamps tell that their content is
/// the same. At most 10,000 records.
Json::Value AccessSetRequest(const std::string& index_id, const std::vector<SeenAccess>& records);
Json::Value DeleteDocumentRequest(const std::string& index_id, const std::string& path);

// Documents by a query.

/// What documents a request is about: the value of "qsl".
Json::Value AllBelow(const std::string& folder);  ///< not the folder's own document
Json::Value DirectlyIn(const std::string& folder);
Json::Value OnlyAt(const std::string& path);
Json::Value Unread();                     ///< those whose content could not be read, or not all of it
Json::Value OfFileNumber(uint64_t file);  ///< those of the file of that inode number
Json::Value Suspects();                   ///< of files with several names, one of which changed or went

Json::Value DeleteDocumentsRequest(const std::string& index_id, Json::Value which);

/// A query with its page. Documents come in byte order of their paths.
struct DocumentQuery {
  Json::Value which;                     ///< one of the above
  std::vector<std::string> fields = {};  ///< that each result is to have; empty: all but the text
  unsigned limit = 0;                    ///< the most results; 0: all
  std::string after = {};                ///< only paths behind this one; "": from the first
};
Json::Value FindDocumentsRequest(const std::string& index_id, DocumentQuery query);

/// The folders at and below `path` that have documents directly in them, with digests of these (folder_digest.h), in
/// byte order of their paths with a "/" at the end, those behind `after`; "": from the first.
Json::Value FolderDigestsRequest(const std::string& index_id, const std::string& path, const std::string& after,
                                 uint64_t seed);

// Others.

/// Rebuilds the words that a search suggests when it finds nothing.
Json::Value TermSuggestionRequest(const std::string& db_name, const std::string& field);

/// Several requests in one, carried out in order. The engine answers each; one that fails does not stop the others.
Json::Value CompoundRequest(std::vector<Json::Value> parts);

}  // namespace ferrox::wire
