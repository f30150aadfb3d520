#include "wire/trust.h"

#include <json/value.h>

#include "common/paths.h"
#include "wire/frame_client.h"

namespace ferrox::wire {

namespace {

bool ReadUids(const Json::Value& list, std::vector<uint32_t>& uids) {
  if (!list.isArray()) return false;
  for (const Json::Value& uid : list) {
    if (!uid.isUInt()) return false;
    uids.push_back(uid.asUInt());
  }
  return true;
}

}  // namespace

/// A member that is not as it must be makes it no answer.
std::optional<Trust> AskTrust(std::chrono::milliseconds longest) {
  const Reply reply = AskDaemon(kAccessSocket, "trust", Json::Value(), longest);
  if (reply.outcome != Outcome::kAnswered || !reply.data.isObject()) return std::nullopt;
  Trust trust;
  const bool read = reply.data["least_user"].isUInt() && ReadUids(reply.data["clients"], trust.clients) &&
                    ReadUids(reply.data["ended"], trust.ended);
  if (!read) return std::nullopt;
  trust.least_user = reply.data["least_user"].asUInt();
  if (reply.data["memory"].isUInt()) trust.memory_mib = reply.data["memory"].asUInt();
  return trust;
}

}  // namespace ferrox::wire
