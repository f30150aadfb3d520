#include "services/kovaelasticd/commands/commands.h"

#include <unistd.h>

#include "services/kovaelasticd/commands/members.h"

namespace ferrox::engine {

namespace {

Json::Value OnCommit(CommandCall& call) {
  call.registry.Open(IndexId(call.data)).index->Commit();
  return {};
}

Json::Value OnUpdateTermSuggestion(CommandCall& call) {
  (void)RequiredText(call.data, "doc_id_field");
  const Registry::OpenIndex open = call.registry.Open(RequiredText(call.data, "db_name"));
  open.index->Write([](IndexStore& store) { store.RebuildSuggestions(); });
  return {};
}

Json::Value OnPing(CommandCall& /*call*/) {
  Json::Value result;
  result["version"] = kVersion;
  result["pid"] = getpid();
  return result;
}

constexpr Command kOtherCommands[] = {{"access_set", &RunAccessSet, Users::kPrivileged},
                                      {"folder_digests", &RunFolderDigests, Users::kPrivileged},
                                      {"commit", &OnCommit, Users::kPrivileged},
                                      {"update_term_suggestion", &OnUpdateTermSuggestion, Users::kPrivileged},
                                      {"search", &RunSearch, Users::kEveryoneAndFor},
                                      {"complete", &RunComplete, Users::kEveryoneAndFor},
                                      {"show", &RunShow, Users::kEveryoneAndFor},
                                      {"fresh", &RunFresh, Users::kEveryoneAndFor},
                                      {"shares", &RunShares, Users::kEveryoneAndFor},
                                      {"ping", &OnPing, Users::kEveryone}};

}  // namespace

const Command* FindCommand(const std::string& name) {
  for (const std::span<const Command> commands :
       {IndexCommands(), DocumentCommands(), std::span<const Command>(kOtherCommands)}) {
    for (const Command& command : commands) {
      if (name == command.name) return &command;
    }
  }
  return nullptr;
}

}  // namespace ferrox::engine
