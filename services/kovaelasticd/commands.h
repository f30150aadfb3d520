#pragma once

#include <optional>
#include <string>

#include <json/value.h>

#include "services/kovaelasticd/registry.h"

namespace ferrox::engine {

/// One command of a request: what it may read and where its result goes.
struct CommandCall {
  Registry& registry;
  Json::Value& data;  ///< the request's "data", an object; may be used up
};

/// What a command does; returns the reply's "data", null for none. Everything is checked before anything is changed.
/// @throws Error with the reply's code and sentence.
using CommandFunction = Json::Value (*)(CommandCall& call);

/// A command by its name; null when there is none. `for_all` tells whether every user may use it.
struct Command {
  const char* name;
  CommandFunction run;
  bool for_all;
};
const Command* FindCommand(const std::string& name);

/// One change of a document, checked.
struct DocumentChange {
  enum class Type { kUpsert, kSet, kDelete, kDeletePrefix };
  Type type;
  std::string path;
  const Json::Value* data = nullptr;  ///< into the request
};

/// Whether the command changes a document; such commands of one compound are carried out together.
bool IsDocumentChange(const std::string& command);
/// @throws Error kEngineBadRequest.
DocumentChange ReadDocumentChange(const std::string& command, const Registry::OpenIndex& index, Json::Value& data);
void Apply(IndexStore& store, const DocumentChange& change);

// Reading of members, common to all commands. @throws Error kEngineBadRequest naming the member and what it must be.
/// The product's version, from the build.
inline constexpr char kVersion[] = FERROX_VERSION;

std::string RequiredText(const Json::Value& data, const char* name);
std::optional<std::string> OptionalText(const Json::Value& data, const char* name);
const Json::Value& RequiredObject(const Json::Value& data, const char* name);
int64_t OptionalInt(const Json::Value& data, const char* name, int64_t otherwise, int64_t low, int64_t high);
bool OptionalBool(const Json::Value& data, const char* name, bool otherwise);

Json::Value RunSearch(CommandCall& call);

/// {"success":false,"error":{"code":...,"msg":...}}
Json::Value FailureReply(int code, const std::string& sentence);
/// {"success":true,"data":...}; without "data" when it is null.
Json::Value SuccessReply(Json::Value data);

}  // namespace ferrox::engine
