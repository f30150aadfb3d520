#include <limits>

#include "services/kovaelasticd/commands/commands.h"
#include "services/kovaelasticd/commands/members.h"
#include "wire/fields.h"

namespace ferrox::engine {

namespace {

constexpr int64_t kFoldersMax = 10000;

DigestRequest ReadDigestRequest(const Json::Value& data) {
  DigestRequest request;
  request.path = CheckedPath("path", RequiredText(data, "path")) + "/";
  if (!data["seed"].isUInt64()) RefuseMember("seed", "a whole number of 64 bits");
  request.seed = data["seed"].asUInt64();
  const std::string after = OptionalText(data, "after").value_or("");
  if (!after.empty()) request.after = after + "/";
  request.limit = OptionalInt(data, "limit", request.limit, 1, kFoldersMax);
  return request;
}

Json::Value FolderEntry(const FolderState& folder) {
  Json::Value entry;
  entry["path"] = folder.path.substr(0, folder.path.size() - 1);
  if (!folder.digest.has_value()) return entry;
  entry["documents"] = Json::Int64(folder.documents);
  entry["digest"] = Json::UInt64(*folder.digest);
  for (const UnreadContent& unread : folder.unread) {
    Json::Value& kind = entry["unread"].append(Json::objectValue);
    kind["type"] = unread.type;
    kind["version"] = Json::Int64(unread.version);
  }
  return entry;
}

}  // namespace

Json::Value RunFolderDigests(CommandCall& call) {
  const Registry::OpenIndex open = call.registry.Open(IndexId(call.data));
  const DigestRequest request = ReadDigestRequest(call.data);
  DigestPage page;
  open.index->Read([&](IndexStore& store) { page = store.Digests(request); });
  Json::Value reply;
  Json::Value& folders = reply["folders"] = Json::Value(Json::arrayValue);
  for (const FolderState& folder : page.folders) folders.append(FolderEntry(folder));
  if (page.more) reply["more"] = true;
  return reply;
}

}  // namespace ferrox::engine
