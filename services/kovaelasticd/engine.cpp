#include "services/kovaelasticd/engine.h"

#include <unistd.h>

#include <optional>
#include <vector>

#include "common/json_util.h"
#include "common/log.h"

namespace ferrox::engine {

namespace {

constexpr char kShapeText[] = "a request is a JSON object {\"command\": ..., \"data\": {...}} or {\"compound\": [...]}";

int ReplyCode(const Error& error) {
  // A fault in reading the request that no command named itself.
  return error.Code() == Error::kBadArgument ? Error::kEngineBadRequest : error.Code();
}

const Command& KnownCommand(const Json::Value& part) {
  const bool shaped = part.isObject() && part["command"].isString() && IsJsonObject(part["data"]);
  if (!shaped) throw Error(Error::kEngineBadRequest, kShapeText);
  const Command* command = FindCommand(part["command"].asString());
  if (command == nullptr) {
    throw Error(Error::kEngineUnknownCommand,
                "there is no command \"" + part["command"].asString() + "\"; see the list in docs/formats/engine.md");
  }
  return *command;
}

void RequireRights(const Command& command, const services::Peer& peer) {
  if (command.for_all || peer.uid == 0 || peer.uid == geteuid()) return;
  throw Error(Error::kEngineNotPermitted, "user " + std::to_string(peer.uid) + " may not use \"" + command.name +
                                              "\"; only root and the engine's own user may");
}

Json::Value& DataOf(Json::Value& part) {
  Json::Value& data = part["data"];
  if (data.isNull()) data = Json::Value(Json::objectValue);
  return data;
}

/// Runs `run` and turns what it throws into a failure reply.
template <typename Run>
Json::Value ReplyOf(Run run) {
  try {
    return run();
  } catch (const Error& error) {
    return FailureReply(ReplyCode(error), error.what());
  } catch (const Json::Exception& error) {
    return FailureReply(Error::kEngineBadRequest, std::string("the request cannot be read: ") + error.what());
  } catch (const std::bad_alloc&) {
    return FailureReply(Error::kEngineBusyMemory, "the engine is short of memory; ask again later");
  }
}

bool Failed(const Json::Value& reply) { return !reply["success"].asBool(); }

}  // namespace

Json::Value FailureReply(int code, const std::string& sentence) {
  Json::Value reply;
  reply["success"] = false;
  reply["error"]["code"] = code;
  reply["error"]["msg"] = sentence;
  return reply;
}

Json::Value SuccessReply(Json::Value data) {
  Json::Value reply;
  reply["success"] = true;
  if (!data.isNull()) reply["data"] = std::move(data);
  return reply;
}

Engine::Engine(const std::string& state_folder) : registry_(state_folder) {}

std::string Engine::Handle(const std::string& request, const services::Peer& peer) {
  return toString(ReplyOf([&] { return Answer(request, peer); }));
}

Json::Value Engine::Answer(const std::string& request, const services::Peer& peer) {
  Json::Value parsed;
  if (!fromString(parsed, request) || !parsed.isObject()) throw Error(Error::kEngineBadRequest, kShapeText);
  if (!parsed.isMember("compound")) {
    const Command& command = KnownCommand(parsed);
    RequireRights(command, peer);
    CommandCall call{registry_, DataOf(parsed)};
    return SuccessReply(command.run(call));
  }
  Json::Value& parts = parsed["compound"];
  if (!parts.isArray()) throw Error(Error::kEngineBadRequest, kShapeText);
  for (const Json::Value& part : parts) RequireRights(KnownCommand(part), peer);
  return AnswerCompound(parts);
}

/// The parts in order; neighbours that change documents of one index are carried out in one go.
Json::Value Engine::AnswerCompound(Json::Value& parts) {
  Json::Value answers(Json::arrayValue);
  bool suggestions_done = false;
  for (Json::ArrayIndex i = 0; i < parts.size();) {
    const std::string name = parts[i]["command"].asString();
    if (IsDocumentChange(name)) {
      i = static_cast<Json::ArrayIndex>(AnswerChanges(parts, i, answers));
      continue;
    }
    Json::Value& data = DataOf(parts[i++]);
    // One rebuilding serves all the documents that are named.
    const bool repeated = name == "update_term_suggestion" && suggestions_done;
    answers.append(repeated ? SuccessReply(Json::Value()) : ReplyOf([&] {
      CommandCall call{registry_, data};
      return SuccessReply(FindCommand(name)->run(call));
    }));
    suggestions_done = suggestions_done || (name == "update_term_suggestion" && !Failed(answers[answers.size() - 1]));
  }
  bool has_fail = false;
  for (const Json::Value& answer : answers) has_fail = has_fail || Failed(answer);
  Json::Value reply;
  reply["success"] = true;
  reply["has_fail"] = has_fail;
  reply["data"] = std::move(answers);
  return reply;
}

/// Carries out the changes from `first` on that are for the same index; returns the place behind the last.
size_t Engine::AnswerChanges(Json::Value& parts, Json::ArrayIndex first, Json::Value& answers) {
  const Json::Value id = parts[first]["data"]["id"];
  Json::ArrayIndex end = first;
  while (end < parts.size() && IsDocumentChange(parts[end]["command"].asString()) && parts[end]["data"]["id"] == id) {
    ++end;
  }
  std::vector<std::optional<DocumentChange>> changes(end - first);
  std::vector<Json::Value> replies(end - first, SuccessReply(Json::Value()));
  std::shared_ptr<Index> index;
  for (Json::ArrayIndex i = first; i < end; ++i) {
    const Json::Value reply = ReplyOf([&] {
      Json::Value& data = DataOf(parts[i]);
      const Registry::OpenIndex open = registry_.Open(RequiredText(data, "id"));
      changes[i - first] = ReadDocumentChange(parts[i]["command"].asString(), open, data);
      index = open.index;
      return SuccessReply(Json::Value());
    });
    if (Failed(reply)) replies[i - first] = reply;
  }
  if (index != nullptr) {
    index->Write([&](IndexStore& store) {
      for (size_t i = 0; i < changes.size(); ++i) {
        if (!changes[i].has_value()) continue;
        try {
          Apply(store, *changes[i]);
        } catch (const Error& error) {
          if (error.Code() == Error::kEngineStorage) throw;
          replies[i] = FailureReply(ReplyCode(error), error.what());
        }
      }
    });
  }
  for (Json::Value& reply : replies) answers.append(std::move(reply));
  return end;
}

}  // namespace ferrox::engine
