#pragma once

#include <algorithm>
#include <memory>
#include <string>
#include <vector>

#include <json/value.h>

#include "services/kovaelasticd/query/query.h"
#include "services/kovaelasticd/store/fts.h"
#include "services/kovaelasticd/store/sqlite_store.h"

namespace ferrox::engine {

/// The document of a file: what every extractor tells, and its text unless that is empty.
inline Json::Value FileDocument(const std::string& path, const std::string& text = "", int64_t mtime = 1700000000) {
  Json::Value document;
  document["KOVAMDPath"] = path;
  document["KOVAMDParent"] = path.substr(0, path.rfind('/'));
  for (const char* name : {"KOVAMDFSName", "KOVAMDSearchFileName", "KOVAMDDisplayName"}) {
    document[name] = path.substr(path.rfind('/') + 1);
  }
  document["KOVAMDIsDir"] = false;
  document["KOVAMDFSSize"] = Json::Int64(text.size());
  document["KOVAMDFSContentChangeDate"] = Json::Int64(mtime);
  if (!text.empty()) document["KOVAMDTextContent"] = text;
  return document;
}

inline std::shared_ptr<const Schema> PlainSchema() { return std::make_shared<Schema>(Json::Value()); }

inline SearchReply Find(IndexStore& store, const std::string& text, SearchRequest request = {}) {
  const QueryNode query = ParseQuery(text, 1718000000);
  request.query = &query;
  return store.Search(request);
}

/// The paths of all hits, in the order of their bytes, one a line.
inline std::string Paths(const SearchReply& reply, bool sorted = true) {
  std::vector<std::string> paths;
  for (const SearchHit& hit : reply.hits) paths.push_back(hit.path);
  if (sorted) std::sort(paths.begin(), paths.end());
  std::string joined;
  for (const std::string& path : paths) joined += (joined.empty() ? "" : "\n") + path;
  return joined;
}

inline std::string FindPaths(IndexStore& store, const std::string& text) { return Paths(Find(store, text)); }

/// The words of a full-text table of a file that nobody writes to, in the order of their bytes; where they stand, too.
inline std::string TermsIn(const std::string& file, const std::string& table, const std::string& columns = "term",
                           const std::string& kind = "row") {
  Database database(file, Database::Mode::kRead);
  RegisterFullText(database);
  database.Execute("CREATE VIRTUAL TABLE temp.terms USING fts5vocab('main', '" + table + "', '" + kind + "')");
  std::string terms;
  for (Statement rows = database.Prepare("SELECT " + columns + " FROM temp.terms"); rows.Step();)
    terms += std::string(rows.Text(0)) + " ";
  return terms;
}

}  // namespace ferrox::engine
