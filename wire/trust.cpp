#include "wire/trust.h"

#include <json/value.h>

#include "common/paths.h"
#include "wire/frame_client.h"

namespace ferrox::wire {

/// A member that is not as it must be makes it no answer.
std::optional<Trust> AskTrust(std::chrono::milliseconds longest) {
  const Reply reply = AskDaemon(kAccessSocket, "trust", Json::Value(), longest);
  if (reply.outcome != Outcome::kAnswered || !reply.data.isObject()) return std::nullopt;
  const Json::Value& clients = reply.data["clients"];
  if (!clients.isArray() || !reply.data["least_user"].isUInt()) return std::nullopt;
  Trust trust;
  trust.least_user = reply.data["least_user"].asUInt();
  for (const Json::Value& uid : clients) {
    if (!uid.isUInt()) return std::nullopt;
    trust.clients.push_back(uid.asUInt());
  }
  return trust;
}

}  // namespace ferrox::wire
