#include "fileindex/elastic/elastic_control.h"

#include <cxxabi.h>

#include <utility>

#include <kova/content_extract.h>

#include "common/json_util.h"
#include "common/log.h"
#include "common/new_class.h"
#include "fileindex/elastic/comm.h"
#include "fileindex/elastic/requests.h"
#include "fileindex/status_mgr.h"
#include "sdk/share.h"
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
  SendRequest(res, QueryBelowRequest(index_id, dir, fields));
  const Json::Value& data = std::as_const(res)["data"];
  FERROX_FAIL_IF_AS(!res.isMember("data") || !IsJsonArray(data), "!res.isMember(\"data\") || !res[\"data\"].isArray()",
                    Error::kBadEngineReply, toString(res));
  return data;
}

}  // namespace

std::string GetFileIndexID(const std::string& share) { return "fileindex_" + share; }

void ShareIndexCreate(const std::string& share) {
  SendRequest(CreateRequest(GetFileIndexID(share), sdk::SDKShare(share).GetDBPath()));
}

void ShareIndexPause(const std::string& share) { SendRequest(IndexRequest("index_pause", GetFileIndexID(share))); }

void ShareIndexResume(const std::string& share) { SendRequest(IndexRequest("index_resume", GetFileIndexID(share))); }

void ShareIndexDelete(const std::string& share) { SendRequest(IndexRequest("index_delete", GetFileIndexID(share))); }

void ShareIndexMigrate(const std::string& share, const std::string& db_path) {
  SendRequest(ConfigRequest(GetFileIndexID(share), "", db_path));
}

void ShareIndexRename(const std::string& share_from, const std::string& share_to, const std::string& db_path) {
  SendRequest(ConfigRequest(GetFileIndexID(share_from), GetFileIndexID(share_to), db_path));
}

void IndexUpsert(const std::string& share, const std::string& path, bool need_meta) {
  SendRequest(UpsertRequest(GetFileIndexID(share), path, BuildDocument(path, need_meta)));
}

void IndexAttr(const std::string& share, const std::string& path) {
  SendRequest(SetRequest(GetFileIndexID(share), path, BuildDocument(path, false)));
}

void IndexDel(const std::string& share, const std::string& path) {
  SendRequest(DocumentRequest("document_del_by_id", GetFileIndexID(share), path));
}

void IndexDelDir(const std::string& share, const std::string& dir) {
  SendRequest(DeleteBelowRequest(GetFileIndexID(share), dir));
}

void IndexRename(const std::string& share, const std::string& new_path, const std::string& old_path) {
  const std::string index_id = GetFileIndexID(share);
  Json::Value res;
  SendRequest(res, SetRequest(index_id, old_path, MovedDocument(new_path)));
  const Json::Value below = ListBelow(index_id, old_path, {kKOVAMDPath, kKOVAMDFSName, kKOVAMDParent});
  SendRequest(MoveBelowRequest(index_id, new_path, old_path, below));
}

void IndexGetByPrefixPath(const std::string& index_id, const std::string& prefix, std::vector<std::string>& paths) {
  for (const Json::Value& entry : ListBelow(index_id, prefix, {kKOVAMDPath})) {
    FERROX_FAIL_IF(!IsJsonObject(entry) || !isJsonType<std::string>(entry.get(kKOVAMDPath, "")),
                   Error::kEngineUnreachable, "Recv failed, res=" + toString(entry),
                   Subject{Subject::kEngineReply, ""});
    if (entry.isMember(kKOVAMDPath)) paths.push_back(entry[kKOVAMDPath].asString());
  }
}

void IndexCommit(const std::string& share_name) {
  try {
    SendRequest(IndexRequest("commit", GetFileIndexID(share_name)));
  } catch (const Error&) {
    const sdk::SDKShare share(share_name);
    if (share.IsSpaceEnough()) throw;
    newClass<StatusMgr>()->SetShareStatus(share_name, StatusMgr::kNeedReindex);
    FERROX_FAIL_IF_AS(true, "!share.IsSpaceEnough()", Error::kSpaceNotEnough,
                      "Share (" + share_name + ") space not enough");
  }
}

void UpdateTermSuggestion(const std::string& db_name, const std::vector<std::string>& fields) {
  SendRequest(TermSuggestionRequest(db_name, fields));
}

}  // namespace ferrox::fileindex::elastic
