#include "services/fileindexd/share_report.h"

#include <memory>
#include <string>
#include <vector>

#include "base/path.h"
#include "common/error.h"
#include "sdk/share.h"

namespace ferrox::indexd {

namespace {

/// What is mounted below the share's folder and so left out. An encrypted share is a mount of its own, and takes those
/// below it for its own too.
std::vector<std::string> MountsLeftOut(const ShareContext& context) {
  try {
    if (sdk::SDKShare(context.share).IsEncryption()) return {};
    return context.environment.mounts_below(context.root);
  } catch (const Error&) {
    return {};  // the share is gone
  }
}

/// Passes the outermost of paths that come in ascending order.
class Outermost {
 public:
  bool Takes(const std::string& path) {
    if (!last_.empty() && base::IsBelow(path, last_)) return false;
    last_ = path;
    return true;
  }

 private:
  std::string last_;
};

/// The folders under indexed ones that are not indexed here, for reasons that only the configuration and the mounts
/// tell.
Json::Value LeftOut(const ShareContext& context, const ShareFolders& folders) {
  Json::Value list(Json::arrayValue);
  Outermost inner_shares;
  for (const auto& [path, share] : folders.Inner()) {
    if (!inner_shares.Takes(path)) continue;
    Json::Value& entry = list.append(Json::Value());
    entry["path"] = path;
    entry["share"] = share;
    entry["reason"] = "its files are those of share " + share;
  }
  Outermost mounts;
  for (const std::string& point : MountsLeftOut(context)) {
    if (folders.PlaceOf(point) == ShareFolders::Place::kOutside || !mounts.Takes(point)) continue;
    Json::Value& entry = list.append(Json::Value());
    entry["path"] = point;
    entry["reason"] = "another file system is mounted there; 'fileindexctl share add' makes it a share of its own";
  }
  return list;
}

}  // namespace

Json::Value ReportShare(const ShareContext& context) {
  Json::Value json = context.status.ToJson();
  json["share"] = context.share;
  json["path"] = context.root;
  const std::shared_ptr<const ShareFolders> folders = context.folders.LastLoaded();
  json["folders"] = Json::UInt64(folders == nullptr ? 0 : folders->Count());
  if (folders != nullptr) json["left_out"] = LeftOut(context, *folders);
  json["queue"] = context.queue.Path();
  // The worker may not have noticed yet that the pause is over.
  const bool pause_over = json["state"] == "paused" && !json.isMember("detail") && !context.environment.pause.Paused();
  if (pause_over) json["state"] = "starting";
  const uint64_t operations = json["operations"].asUInt64();
  const uint64_t detached =
      operations != 0 ? operations - json["operations_done"].asUInt64() : context.queue.CountDetachedLines();
  json["queued"] = Json::UInt64(detached + context.queue.CountLines());
  const int64_t oldest = context.queue.OldestChange();
  if (oldest > 0) json["oldest_change"] = Json::Int64(oldest);
  return json;
}

}  // namespace ferrox::indexd
