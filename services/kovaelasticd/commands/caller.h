#pragma once

#include <cstdint>
#include <optional>
#include <vector>

#include <json/value.h>

#include "services/kovaelasticd/commands/named_users.h"
#include "services/kovaelasticd/store/asker.h"
#include "services/support/frame_server.h"

namespace ferrox::engine {

/// Who sends a request, as the kernel says it: nothing that the request holds changes it.
struct Caller {
  uint32_t uid = 0;
  std::vector<uint32_t> groups;  ///< all of the process's, each once, in ascending order
  bool privileged = false;       ///< root, the owner of the instance, the engine's own user: sees and does everything
};

Caller CallerOf(const services::Peer& peer, uint32_t instance_owner);

/// For whom an answer is, without a share yet: for `named` where that is not null; for the caller; or, when a
/// privileged one asks "as" somebody else, for that user, who is {"uid", "groups"}. Nothing when whoever gets the
/// answer may see everything.
/// @throws Error kEngineNotPermitted for another "as" of an ordinary user; kEngineBadRequest.
std::optional<Asker> AskerOf(const Caller& caller, const Json::Value& data, const NamedUserPtr& named);

}  // namespace ferrox::engine
