#include "services/fileindexd/share_index.h"

#include <syslog.h>

#include "common/file_util.h"
#include "common/json_util.h"
#include "common/log.h"
#include "fileindex/elastic/comm.h"
#include "fileindex/elastic/elastic_control.h"
#include "wire/frame_client.h"

namespace ferrox::indexd {

namespace {

namespace elastic = fileindex::elastic;

constexpr char kPathField[] = "KOVAMDPath";
constexpr char kStampField[] = "_KOVAStamp";
constexpr char kNeedMetaField[] = "_KOVANeedMeta";
constexpr char kTypeField[] = "KOVAMDContentType";
constexpr char kVersionField[] = "_KOVAExtractVersion";
constexpr char kErrorField[] = "_KOVAExtractError";
constexpr char kCutField[] = "_KOVATextCut";

IndexedEntry ToEntry(const Json::Value& fields) {
  IndexedEntry entry;
  GetJsonValue(entry.path, fields, kPathField, true);
  GetJsonValue(entry.stamp, fields, kStampField, false);
  GetJsonValue(entry.with_content, fields, kNeedMetaField, false);
  GetJsonValue(entry.content_type, fields, kTypeField, false);
  GetJsonValue(entry.extract_version, fields, kVersionField, false);
  entry.extract_failed = fields.isMember(kErrorField);
  entry.cut_untold = fields.isMember(kCutField) && !entry.extract_failed;
  return entry;
}

/// The engine channel only logs that a part of a compound request failed.
void ThrowIfFailed(const Json::Value& part) {
  bool success = false;
  GetJsonValue(success, part, "success", true);
  if (success) return;
  int code = 0;
  std::string message;
  GetJsonValue(code, part["error"], "code", true);
  GetJsonValue(message, part["error"], "msg", true);
  throw Error(static_cast<Error::ErrorCode>(code), message);
}

class Engine : public ShareIndex {
 public:
  explicit Engine(const std::string& share) : share_(share), id_(elastic::GetFileIndexID(share)) {}

  bool Exists() override {
    Json::Value request = Request("index_stat");
    Json::Value reply;
    try {
      elastic::SendRequest(reply, request);
    } catch (const Error& error) {
      if (error.Code() == Error::kEngineNoSuchIndex) return false;
      throw;
    }
    return true;
  }

  void Create() override {
    try {
      return elastic::ShareIndexCreate(share_);
    } catch (const Error& error) {
      if (error.Code() != Error::kEngineIndexExists) throw;
      Log(LOG_WARNING, "index %s belongs to another folder of that name; it is made anew", id_.c_str());
    }
    elastic::ShareIndexDelete(share_);
    elastic::ShareIndexCreate(share_);
  }

  int64_t Rebuilding() override {
    Json::Value reply;
    elastic::SendRequest(reply, Request("index_stat"));
    long long since = 0;
    GetJsonValue(since, reply["data"]["rebuilding"], "since", false);
    return since;
  }

  void EndRebuilding(int64_t which) override {
    Json::Value request = Request("index_rebuilt");
    request["data"]["since"] = Json::Int64(which);
    elastic::SendRequest(request);
  }

  void Resume() override { elastic::ShareIndexResume(share_); }
  void Upsert(const std::string& path, bool need_meta) override { elastic::IndexUpsert(share_, path, need_meta); }
  void Attr(const std::string& path) override { elastic::IndexAttr(share_, path); }
  void Delete(const std::vector<std::string>& paths, bool and_below) override {
    if (paths.size() == 1) {
      elastic::IndexDel(share_, paths.front());
      if (and_below) elastic::IndexDelDir(share_, paths.front());
      return;
    }
    Json::Value request;
    for (const std::string& path : paths) {
      Json::Value part = Request("document_del_by_id");
      part["data"]["doc_id"] = path;
      request["compound"].append(std::move(part));
      if (!and_below) continue;
      part = Request("document_del_by_query");
      part["data"]["query"]["qsl"]["prefix"][kPathField] = path + "/";
      request["compound"].append(std::move(part));
    }
    Json::Value reply;
    elastic::SendRequest(reply, request);
    for (const Json::Value& part : reply["data"]) ThrowIfFailed(part);
  }
  void Rename(const std::string& new_path, const std::string& old_path) override {
    elastic::IndexRename(share_, new_path, old_path);
  }
  void Commit() override { elastic::IndexCommit(share_); }

  std::vector<IndexedEntry> List(const std::string& folder, const std::string& after, unsigned limit) override {
    Json::Value query;
    query["qsl"]["prefix"][kPathField] = folder + "/";
    query["limit"] = limit;
    if (!after.empty()) query["after"] = after;
    return Query(std::move(query));
  }

  std::vector<IndexedEntry> Find(const std::string& path) override {
    Json::Value query;
    query["qsl"]["term"][kPathField] = path;
    query["limit"] = 1;
    return Query(std::move(query));
  }

  std::vector<IndexedEntry> Suspects(const std::string& after, unsigned limit) override {
    return Page("suspects", true, after, limit);
  }

  std::vector<IndexedEntry> OfFile(uint64_t file, const std::string& after, unsigned limit) override {
    return Page("file", Json::UInt64(file), after, limit);
  }

  Json::Value Figures(std::chrono::milliseconds longest) override {
    wire::Reply reply = wire::AskEngine(Request("index_stat"), longest);
    if (reply.outcome != wire::Outcome::kRefused) return std::move(reply.data);
    Json::Value refused;
    refused["error"] = std::move(reply.error);
    return refused;
  }

 private:
  Json::Value Request(const char* command) const {
    Json::Value request;
    request["command"] = command;
    request["data"]["id"] = id_;
    return request;
  }

  std::vector<IndexedEntry> Page(const char* which, const Json::Value& value, const std::string& after,
                                 unsigned limit) const {
    Json::Value query;
    query["qsl"][which] = value;
    query["limit"] = limit;
    if (!after.empty()) query["after"] = after;
    return Query(std::move(query));
  }

  std::vector<IndexedEntry> Query(Json::Value query) const {
    for (const char* field :
         {kPathField, kStampField, kNeedMetaField, kTypeField, kVersionField, kErrorField, kCutField}) {
      query["load_field"].append(field);
    }
    Json::Value request = Request("document_get_by_query");
    request["data"]["query"] = std::move(query);
    Json::Value reply;
    elastic::SendRequest(reply, request);
    const Json::Value& data = reply["data"];
    FERROX_FAIL_IF(!data.isArray(), Error::kBadEngineReply, toString(reply));
    std::vector<IndexedEntry> entries;
    entries.reserve(data.size());
    for (const Json::Value& fields : data) entries.push_back(ToEntry(fields));
    return entries;
  }

  std::string share_;
  std::string id_;
};

}  // namespace

std::vector<std::string> SharesBeingRebuilt() {
  Json::Value request;
  request["command"] = "index_list";
  request["data"]["figures"] = false;
  const std::string prefix = elastic::GetFileIndexID("");
  std::vector<std::string> shares;
  const wire::Reply reply = wire::AskEngine(request, std::chrono::seconds(2));
  if (!reply.data.isArray()) return shares;
  for (const Json::Value& index : reply.data) {
    std::string id;
    GetJsonValue(id, index, "id", false);
    if (index.isMember("rebuilding") && StringStartWith(id, prefix)) shares.push_back(id.substr(prefix.size()));
  }
  return shares;
}

std::unique_ptr<ShareIndex> EngineShareIndex(const std::string& share) { return std::make_unique<Engine>(share); }

}  // namespace ferrox::indexd
