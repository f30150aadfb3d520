#include "fileindex/elastic/elastic_control.h"

#include <cxxabi.h>

#include <utility>

#include <kova/content_extract.h>

#include "common/file_util.h"
#include "common/json_util.h"
#include "common/log.h"
#include "common/new_class.h"
#include "fileindex/elastic/comm.h"
#include "fileindex/status_mgr.h"
#include "sdk/share.h"
#include "wire/engine_requests.h"
#include "wire/fields.h"

namespace ferrox::fileindex::elastic {

namespace {

/// Whether the content extraction gave a document. What a reader throws, of whatever type, makes the file one that
/// cannot be read; only the cancelling of a thread goes on.
bool ParseFile(const std::string& path, const Json::Value& config, Json::Value& document) {
  try {
    KOVA::CONTENT_EXTRACT::ParseFile(path, config, document);
    return IsJsonObject(document);
  } catch (const abi::__forced_unwind&) {
    throw;  // the thread is being cancelled
  } catch (...) {
    return false;
  }
}

/// The document of a file as it is stored: what the extraction gave, and the name once more in the field that searches
/// for names go through.
Json::Value BuildDocument(const std::string& path, bool need_meta) {
  Json::Value config(Json::objectValue);
  Json::Value document(Json::objectValue);
  config[kNeedMeta] = need_meta;
  FERROX_FAIL_IF_AS(!ParseFile(path, config, document), "!ParseFile(path, config, document)", Error::kParseFailed,
                    "Parse failed, path=" + path);
  document[kKOVAMDSearchFileName] = document.get(kKOVAMDFSName, Json::Value());
  return document;
}

/// The documents that lie below `dir`, in the engine's order.
Json::Value ListBelow(const std::string& index_id, const std::string& dir, const std::vector<std::string>& fields) {
  Json::Value res;
  SendRequest(res, wire::FindDocumentsRequest(index_id, {wire::AllBelow(dir), fields}));
  const Json::Value& data = std::as_const(res)["data"];
  FERROX_FAIL_IF_AS(!res.isMember("data") || !IsJsonArray(data), "!res.isMember(\"data\") || !res[\"data\"].isArray()",
                    Error::kBadEngineReply, toString(res));
  return data;
}

/// What changes in the document of an entry that moves to `new_path`.
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

/// One compound that moves the documents `below` (what ListBelow found at the old path) along with their folder.
/// @throws Error kBadArgument when one lacks its name or parent.
Json::Value MoveBelowRequest(const std::string& index_id, const std::string& new_path, const std::string& old_path,
                             const Json::Value& below) {
  std::vector<Json::Value> moves;
  moves.reserve(below.size());
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
    moves.push_back(wire::SetDocumentRequest(index_id, entry.get(kKOVAMDPath, Json::Value()), std::move(document)));
  }
  return wire::CompoundRequest(std::move(moves));
}

}  // namespace

std::string GetFileIndexID(const std::string& share) { return "fileindex_" + share; }

void ShareIndexCreate(const std::string& share) {
  SendRequest(wire::CreateIndexRequest(GetFileIndexID(share), sdk::SDKShare(share).GetDBPath(), GetFileIndexSettings(),
                                       GetFileIndexMappings(), GetFileIndexEventHandler()));
}

void ShareIndexPause(const std::string& share) {
  SendRequest(wire::IndexRequest("index_pause", GetFileIndexID(share)));
}

void ShareIndexResume(const std::string& share) {
  SendRequest(wire::IndexRequest("index_resume", GetFileIndexID(share)));
}

void ShareIndexDelete(const std::string& share) {
  SendRequest(wire::IndexRequest("index_delete", GetFileIndexID(share)));
}

void ShareIndexMigrate(const std::string& share, const std::string& db_path) {
  SendRequest(wire::ConfigureIndexRequest(GetFileIndexID(share), "", db_path));
}

void ShareIndexRename(const std::string& share_from, const std::string& share_to, const std::string& db_path) {
  SendRequest(wire::ConfigureIndexRequest(GetFileIndexID(share_from), GetFileIndexID(share_to), db_path));
}

// The document is built before anything is sent, by reading the file in this thread: what cannot be read changes
// nothing.
void IndexUpsert(const std::string& share, const std::string& path, bool need_meta) {
  SendRequest(wire::UpsertDocumentRequest(GetFileIndexID(share), path, BuildDocument(path, need_meta)));
}

void IndexAttr(const std::string& share, const std::string& path) {
  SendRequest(wire::SetDocumentRequest(GetFileIndexID(share), path, BuildDocument(path, false)));
}

void IndexDel(const std::string& share, const std::string& path) {
  SendRequest(wire::DeleteDocumentRequest(GetFileIndexID(share), path));
}

void IndexDelDir(const std::string& share, const std::string& dir) {
  SendRequest(wire::DeleteDocumentsRequest(GetFileIndexID(share), wire::AllBelow(dir)));
}

/// Three requests: the document itself, then all paths below the old place in one reply, then their moves in one
/// compound. What comes below the old place between the last two stays there until its own event is handled.
void IndexRename(const std::string& share, const std::string& new_path, const std::string& old_path) {
  const std::string index_id = GetFileIndexID(share);
  Json::Value res;
  SendRequest(res, wire::SetDocumentRequest(index_id, old_path, MovedDocument(new_path)));
  const Json::Value below = ListBelow(index_id, old_path, {kKOVAMDPath, kKOVAMDFSName, kKOVAMDParent});
  SendRequest(MoveBelowRequest(index_id, new_path, old_path, below));
}

void IndexMove(const std::string& share, const std::string& new_path, const std::string& old_path,
               const std::string& stamp) {
  SendRequest(wire::MoveFolderRequest(GetFileIndexID(share), old_path, stamp, MovedDocument(new_path)));
}

void IndexGetByPrefixPath(const std::string& index_id, const std::string& prefix, std::vector<std::string>& paths) {
  for (const Json::Value& entry : ListBelow(index_id, prefix, {kKOVAMDPath})) {
    FERROX_FAIL_IF(!IsJsonObject(entry) || !isJsonType<std::string>(entry.get(kKOVAMDPath, "")),
                   Error::kEngineUnreachable, "Recv failed, res=" + toString(entry),
                   Subject{Subject::kEngineReply, ""});
    if (entry.isMember(kKOVAMDPath)) paths.push_back(entry[kKOVAMDPath].asString());
  }
}

/// A commit that fails while the volume is full is reported as that, whatever the engine called it. What was sent since
/// the last commit may be lost, so the share is marked: it is reindexed once there is room.
void IndexCommit(const std::string& share_name) {
  try {
    SendRequest(wire::IndexRequest("commit", GetFileIndexID(share_name)));
  } catch (const Error&) {
    const sdk::SDKShare share(share_name);
    if (share.IsSpaceEnough()) throw;
    newClass<StatusMgr>()->SetShareStatus(share_name, StatusMgr::kNeedReindex);
    FERROX_FAIL_IF_AS(true, "!share.IsSpaceEnough()", Error::kSpaceNotEnough,
                      "Share (" + share_name + ") space not enough");
  }
}

void UpdateTermSuggestion(const std::string& db_name, const std::vector<std::string>& fields) {
  std::vector<Json::Value> parts;
  parts.reserve(fields.size());
  for (const std::string& field : fields) parts.push_back(wire::TermSuggestionRequest(db_name, field));
  SendRequest(wire::CompoundRequest(std::move(parts)));
}

}  // namespace ferrox::fileindex::elastic
