#include "services/kovaelasticd/commands/user_limits.h"

#include "common/error.h"
#include "common/json_util.h"
#include "services/kovaelasticd/commands/caller.h"
#include "services/kovaelasticd/commands/commands.h"

namespace ferrox::engine {

services::UserLimits LimitsOfUsers(uint32_t instance_owner) {
  services::UserLimits limits;
  limits.is_bound = [instance_owner](const services::Peer& peer) { return !CallerOf(peer, instance_owner).privileged; };
  limits.refusal = toString(FailureReply(
      Error::kEngineUserBusy, "you have too many requests at work; ask again when some of them are answered"));
  return limits;
}

}  // namespace ferrox::engine
