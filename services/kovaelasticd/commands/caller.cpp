#include "services/kovaelasticd/commands/caller.h"

#include <unistd.h>

#include <algorithm>

#include "services/kovaelasticd/commands/members.h"
#include "services/kovaelasticd/commands/user_error.h"

namespace ferrox::engine {

namespace {

/// The kernel's NGROUPS_MAX.
constexpr unsigned kGroupsMax = 65536;

void MakeUnique(std::vector<uint32_t>& groups) {
  std::sort(groups.begin(), groups.end());
  groups.erase(std::unique(groups.begin(), groups.end()), groups.end());
}

/// The largest number stands for "no change" where ids are set, and is nobody's.
uint32_t ReadId(const Json::Value& id, const char* name) {
  if (!id.isUInt() || id.asUInt() == UINT32_MAX) RefuseMember(name, "the number of a user or group");
  return id.asUInt();
}

}  // namespace

Caller CallerOf(const services::Peer& peer, uint32_t instance_owner) {
  Caller caller{peer.uid, {peer.groups.begin(), peer.groups.end()}, false};
  caller.groups.push_back(peer.gid);
  MakeUnique(caller.groups);
  caller.privileged = peer.uid == 0 || peer.uid == instance_owner || peer.uid == geteuid();
  return caller;
}

std::optional<Asker> AskerOf(const Caller& caller, const Json::Value& data, const NamedUserPtr& named) {
  if (named != nullptr) return Asker{named->uid, named->groups, ""};
  const Json::Value& as = data["as"];
  if (as.isNull()) return caller.privileged ? std::nullopt : std::optional(Asker{caller.uid, caller.groups, ""});
  if (!caller.privileged) throw UserError(Error::kEngineNotPermitted, "only root may ask as another user");
  if (!as.isObject()) RefuseMember("as", "an object with \"uid\" and \"groups\"");
  Asker asker{ReadId(as["uid"], "uid"), {}, ""};
  if (asker.uid == 0) RefuseMember("uid", "the number of an ordinary user");
  const Json::Value& groups = as["groups"];
  if (!groups.isArray() || groups.empty() || groups.size() > kGroupsMax)
    RefuseMember("groups", "an array of 1 to 65536 numbers");
  for (const Json::Value& group : groups) asker.groups.push_back(ReadId(group, "groups"));
  MakeUnique(asker.groups);
  return asker;
}

}  // namespace ferrox::engine
