#pragma once

#include <chrono>
#include <cstdint>
#include <string>

#include <json/value.h>

#include "services/kovaelasticd/commands/caller.h"
#include "services/kovaelasticd/commands/commands.h"
#include "services/kovaelasticd/commands/compound_parts.h"
#include "services/kovaelasticd/commands/live_look.h"
#include "services/kovaelasticd/commands/named_users.h"
#include "services/kovaelasticd/indices/registry.h"
#include "services/support/frame_server.h"

namespace ferrox::engine {

class CompoundReply;

/// Answers the engine's requests (docs/formats/engine.md): one command, or a compound of many, which are carried out in
/// their order and answered one by one. Any number of threads may call Handle; a change waits for the thread of its
/// index, a search for no other request.
class Engine {
 public:
  static constexpr std::chrono::milliseconds kStep{5};

  /// Loads the indices that are noted in `state_folder`. `look`, `users` and `synonyms` are called by any thread.
  /// @throws Error kInternal.
  explicit Engine(const std::string& state_folder, LookFunction look = &LookOnDisk, UserSources users = {},
                  SynonymsFunction synonyms = &NoSynonyms);

  /// One request to one reply, whatever the request holds. What an ordinary user is told leaves at the next full kStep
  /// since the call, so that its time tells less of what others have.
  std::string Handle(const std::string& request, const services::Peer& peer);
  /// Whose the instance is.
  uint32_t InstanceOwner() const { return instance_owner_; }
  /// Whether the user's programs may ask for other users. Does not block.
  bool IsTrusted(uint32_t uid) const { return instance_owner_ == 0 && users_.IsTrusted(uid); }
  /// Ends the requests that wait for other daemons' work, and those to come, because the engine stops.
  void EndWaits() { relay_.Fresh().End(); }

 private:
  std::string Answer(const std::string& request, const Caller& caller);
  void RequireRights(const Command& command, const Caller& caller) const;
  NamedUserPtr NamedBy(const Command& command, const Caller& caller, const Json::Value& data);
  Json::Value Run(const Command& command, const Caller& caller, Json::Value& part);
  std::string AnswerCompound(CompoundParts& parts, const Caller& caller);
  void AnswerChanges(CompoundParts& compound, const Caller& caller, CompoundReply& reply);

  Registry registry_;
  const uint32_t instance_owner_;
  const LookFunction look_;
  const SynonymsFunction synonyms_;
  NamedUsers users_;
  DaemonRelay relay_{registry_};
};

}  // namespace ferrox::engine
