#include "services/fileindexd/share_index.h"

#include <syslog.h>

#include "common/file_util.h"
#include "common/json_util.h"
#include "common/log.h"
#include "fileindex/elastic/comm.h"
#include "fileindex/elastic/elastic_control.h"
#include "wire/engine_requests.h"
#include "wire/fields.h"
#include "wire/frame_client.h"

namespace ferrox::indexd {

namespace {

namespace elastic = fileindex::elastic;

IndexedEntry ToEntry(const Json::Value& fields) {
  IndexedEntry entry;
  GetJsonValue(entry.path, fields, elastic::kKOVAMDPath, true);
  GetJsonValue(entry.stamp, fields, elastic::k_KOVAStamp, false);
  GetJsonValue(entry.with_content, fields, elastic::k_KOVANeedMeta, false);
  GetJsonValue(entry.content_type, fields, elastic::kKOVAMDContentType, false);
  GetJsonValue(entry.extract_version, fields, elastic::k_KOVAExtractVersion, false);
  entry.extract_failed = fields.isMember(elastic::k_KOVAExtractError);
  entry.has_access = fields.isMember(elastic::k_KOVAAccess);
  entry.cut_without_reason = fields.isMember(elastic::k_KOVATextCut) && !entry.extract_failed;
  return entry;
}

FolderState ToFolder(const Json::Value& fields) {
  FolderState folder;
  GetJsonValue(folder.path, fields, "path", true);
  if (fields["digest"].isUInt64()) folder.digest = fields["digest"].asUInt64();
  for (const Json::Value& unread : fields["unread"]) {
    GetJsonValue(folder.unread.emplace_back().type, unread, "type", true);
    GetJsonValue(folder.unread.back().version, unread, "version", true);
  }
  return folder;
}

std::vector<size_t> Positions(const Json::Value& list, size_t end) {
  std::vector<size_t> positions;
  for (const Json::Value& position : list) {
    FERROX_FAIL_IF(!position.isUInt64() || position.asUInt64() >= end, Error::kBadEngineReply, toString(list));
    positions.push_back(position.asUInt64());
  }
  return positions;
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
    try {
      elastic::SendRequest(Request("index_stat"));
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
    long long since = 0;
    GetJsonValue(since, Stat()["rebuilding"], "since", false);
    return since;
  }

  void EndRebuilding(int64_t which) override { elastic::SendRequest(wire::IndexRebuiltRequest(id_, which)); }

  void Resume() override { elastic::ShareIndexResume(share_); }
  void Upsert(const std::string& path, bool need_meta) override { elastic::IndexUpsert(share_, path, need_meta); }
  void Attr(const std::string& path) override { elastic::IndexAttr(share_, path); }
  AccessGaps SetAccess(const std::vector<wire::SeenAccess>& records) override {
    Json::Value reply;
    elastic::SendRequest(reply, wire::AccessSetRequest(id_, records));
    const Json::Value& data = reply["data"];
    FERROX_FAIL_IF(!data.isObject(), Error::kBadEngineReply, toString(reply));
    return {Positions(data["differing"], records.size()), Positions(data["missing"], records.size())};
  }
  uint64_t WithoutAccess() override {
    const Json::Value count = Stat()["without_access"];
    return count.isUInt64() ? count.asUInt64() : 0;
  }
  void EndPreparing() override { elastic::SendRequest(Request("index_prepared")); }
  void NoteShare(const wire::IndexShare& share) override { elastic::SendRequest(wire::IndexShareRequest(id_, share)); }
  void Delete(const std::vector<std::string>& paths, bool and_below) override {
    if (paths.size() == 1) {
      elastic::IndexDel(share_, paths.front());
      if (and_below) elastic::IndexDelDir(share_, paths.front());
      return;
    }
    std::vector<Json::Value> parts;
    for (const std::string& path : paths) {
      parts.push_back(wire::DeleteDocumentRequest(id_, path));
      if (and_below) parts.push_back(wire::DeleteDocumentsRequest(id_, wire::AllBelow(path)));
    }
    Json::Value reply;
    elastic::SendRequest(reply, wire::CompoundRequest(std::move(parts)));
    for (const Json::Value& part : reply["data"]) ThrowIfFailed(part);
  }
  void Move(const std::string& new_path, const std::string& old_path, const std::string& stamp) override {
    elastic::IndexMove(share_, new_path, old_path, stamp);
  }
  void Commit() override { elastic::IndexCommit(share_); }

  std::vector<IndexedEntry> List(const std::string& folder, const std::string& after, unsigned limit) override {
    return Query(wire::AllBelow(folder), limit, after);
  }

  std::vector<IndexedEntry> ListIn(const std::string& folder, const std::string& after, unsigned limit) override {
    return Query(wire::DirectlyIn(folder), limit, after);
  }

  FolderPage Folders(const std::string& folder, const std::string& after, uint64_t seed) override {
    Json::Value reply;
    elastic::SendRequest(reply, wire::FolderDigestsRequest(id_, folder, after, seed));
    const Json::Value& folders = reply["data"]["folders"];
    FERROX_FAIL_IF(!folders.isArray(), Error::kBadEngineReply, toString(reply));
    FolderPage page;
    page.folders.reserve(folders.size());
    for (const Json::Value& fields : folders) page.folders.push_back(ToFolder(fields));
    page.more = reply["data"].isMember("more") && !page.folders.empty();
    return page;
  }

  std::vector<IndexedEntry> Find(const std::string& path) override { return Query(wire::OnlyAt(path), 1, ""); }

  std::vector<IndexedEntry> Suspects(const std::string& after, unsigned limit) override {
    return Query(wire::Suspects(), limit, after);
  }

  std::vector<IndexedEntry> OfFile(uint64_t file, const std::string& after, unsigned limit) override {
    return Query(wire::OfFileNumber(file), limit, after);
  }

  Json::Value Figures(std::chrono::milliseconds longest) override {
    wire::Reply reply = wire::AskEngine(Request("index_stat"), longest);
    if (reply.outcome != wire::Outcome::kRefused) return std::move(reply.data);
    Json::Value refused;
    refused["error"] = std::move(reply.error);
    return refused;
  }

 private:
  Json::Value Request(const char* command) const { return wire::IndexRequest(command, id_); }
  Json::Value Stat() const {
    Json::Value reply;
    elastic::SendRequest(reply, Request("index_stat"));
    return reply["data"];
  }

  std::vector<IndexedEntry> Query(const Json::Value& which, unsigned limit, const std::string& after) const {
    const wire::DocumentQuery query = {
        which,
        {elastic::kKOVAMDPath, elastic::k_KOVAStamp, elastic::k_KOVANeedMeta, elastic::kKOVAMDContentType,
         elastic::k_KOVAExtractVersion, elastic::k_KOVAExtractError, elastic::k_KOVATextCut, elastic::k_KOVAAccess},
        limit,
        after};
    Json::Value reply;
    elastic::SendRequest(reply, wire::FindDocumentsRequest(id_, query));
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
  const std::string prefix = elastic::GetFileIndexID("");
  std::vector<std::string> shares;
  const wire::Reply reply = wire::AskEngine(wire::ListIndicesRequest(false), std::chrono::seconds(2));
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
