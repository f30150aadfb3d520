#pragma once

#include <functional>
#include <memory>
#include <span>
#include <string>

#include <json/value.h>

#include "services/kovaelasticd/commands/caller.h"
#include "services/kovaelasticd/commands/daemon_relay.h"
#include "services/kovaelasticd/commands/live_look.h"
#include "services/kovaelasticd/commands/named_users.h"
#include "services/kovaelasticd/indices/registry.h"
#include "services/kovaelasticd/query/synonyms.h"

namespace ferrox::engine {

/// The commands of docs/formats/engine.md: a table of names and functions. Each function reads its members with the
/// helpers of members.h, which refuse what is missing or of another type by naming it, and does its work through the
/// registry.

/// The synonyms of now, for one search.
using SynonymsFunction = std::function<std::shared_ptr<const Synonyms>()>;
inline std::shared_ptr<const Synonyms> NoSynonyms() { return nullptr; }

/// One command of a request.
struct CommandCall {
  Registry& registry;
  const Caller& caller;
  const LookFunction& look;
  const SynonymsFunction& synonyms;
  DaemonRelay& relay;
  Json::Value& data;             ///< the request's "data", an object; the command may move values out of it
  NamedUserPtr named = nullptr;  ///< for whom "as" asks by name
};

/// What a command does; returns the reply's "data", null for none. Everything is checked before anything is changed.
/// @throws Error with the reply's code and sentence.
using CommandFunction = Json::Value (*)(CommandCall& call);

/// Who may use a command. One for everyone answers ordinary users with what they may know: see AskerOf. One of
/// kEveryoneAndFor trusted clients may use for a user whom they name, too.
enum class Users { kPrivileged, kEveryone, kEveryoneAndFor };

struct Command {
  const char* name;
  CommandFunction run;
  Users users;
};
/// A command by its name; null when there is none.
const Command* FindCommand(const std::string& name);

/// One change of a document, checked.
struct DocumentChange {
  enum class Type { kUpsert, kSet, kMoveFolder, kDelete, kDeletePrefix };
  Type type;
  std::string path;
  const Json::Value* data = nullptr;  ///< into the request
  std::string stamp = {};             ///< of kMoveFolder
};

/// Whether the command changes a document; such commands of one compound are carried out together.
bool IsDocumentChange(const std::string& command);
/// Checks a change against the index's schema. What it returns points into `data`.
/// @throws Error kEngineBadRequest.
DocumentChange ReadDocumentChange(const std::string& command, const Registry::OpenIndex& index, Json::Value& data);
/// Carries out a change, on the index's thread. @throws what the store's member throws.
void Apply(IndexStore& store, const DocumentChange& change);

/// The product's version, from the build.
inline constexpr char kVersion[] = FERROX_VERSION;

// Where the functions are, by source.
std::span<const Command> IndexCommands();     ///< index_commands.cpp
std::span<const Command> DocumentCommands();  ///< document_commands.cpp
/// The command "access_set" (access_command.cpp).
Json::Value RunAccessSet(CommandCall& call);
/// The command "folder_digests" (digest_command.cpp).
Json::Value RunFolderDigests(CommandCall& call);
/// The command "search" (search_command.cpp).
Json::Value RunSearch(CommandCall& call);
/// The command "complete" (complete_command.cpp).
Json::Value RunComplete(CommandCall& call);
/// The command "show" (show_command.cpp).
Json::Value RunShow(CommandCall& call);
/// The commands "fresh" and "shares" (relayed_commands.cpp).
Json::Value RunFresh(CommandCall& call);
Json::Value RunShares(CommandCall& call);

/// {"success":false,"error":{"code":...,"msg":...}}
Json::Value FailureReply(int code, const std::string& sentence);
/// {"success":true,"data":...}; without "data" when it is null.
Json::Value SuccessReply(Json::Value data);

}  // namespace ferrox::engine
