#pragma once

#include <string>

#include <json/value.h>

#include "services/kovaelasticd/commands/commands.h"
#include "services/kovaelasticd/commands/compound_parts.h"
#include "services/kovaelasticd/indices/registry.h"
#include "services/support/frame_server.h"

namespace ferrox::engine {

class CompoundReply;

/// Answers the engine's requests (docs/formats/engine.md): one command, or a compound of many, which are carried out in
/// their order and answered one by one. Any number of threads may call Handle; a change waits for the thread of its
/// index, a search for no other request.
class Engine {
 public:
  /// Loads the indices that are noted in `state_folder`. @throws Error kInternal.
  explicit Engine(const std::string& state_folder);

  /// One request to one reply, whatever the request holds.
  std::string Handle(const std::string& request, const services::Peer& peer);

 private:
  std::string Answer(const std::string& request, const services::Peer& peer);
  std::string AnswerCompound(CompoundParts& parts);
  void AnswerChanges(CompoundParts& compound, CompoundReply& reply);

  Registry registry_;
};

}  // namespace ferrox::engine
