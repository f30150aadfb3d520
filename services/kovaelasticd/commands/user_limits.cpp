#include "services/kovaelasticd/commands/user_limits.h"

#include <utility>

#include "common/error.h"
#include "common/json_util.h"
#include "services/kovaelasticd/commands/caller.h"
#include "services/kovaelasticd/commands/commands.h"

namespace ferrox::engine {

services::UserLimits LimitsOfUsers(uint32_t instance_owner, std::function<bool(uint32_t uid)> is_trusted) {
  services::UserLimits limits;
  limits.is_bound = [instance_owner](const services::Peer& peer) { return !CallerOf(peer, instance_owner).privileged; };
  limits.is_for_many = [trusted = std::move(is_trusted)](const services::Peer& peer) { return trusted(peer.uid); };
  limits.refusal = toString(FailureReply(
      Error::kEngineUserBusy, "you have too many requests at work; ask again when some of them are answered"));
  return limits;
}

}  // namespace ferrox::engine
