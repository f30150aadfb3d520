#include "services/kovaelasticd/commands/engine.h"

#include <optional>
#include <thread>
#include <vector>

#include "common/json_scan.h"
#include "common/json_util.h"
#include "common/log.h"
#include "services/kovaelasticd/commands/members.h"
#include "services/kovaelasticd/commands/share_rules.h"
#include "services/kovaelasticd/commands/user_error.h"
#include "services/kovaelasticd/commands/user_limits.h"
#include "services/kovaelasticd/store/work_limit.h"
#include "services/support/instance_owner.h"

namespace ferrox::engine {

namespace {

/// How many members a request may have at its top; "command", "data" and "compound" are read.
constexpr size_t kMembersMax = 64;
/// Of a compound. Once it is that long, further results are replaced by an error.
constexpr size_t kReplyMaxBytes = 256U << 20;
/// Of an unknown command's name, what the error repeats.
constexpr size_t kNameShownBytes = 100;
constexpr char kNoCompoundText[] = "only root and the owner of the instance may send several commands in one request";

int ReplyCode(const Error& error) {
  // A fault in reading the request that no command named itself.
  return error.Code() == Error::kBadArgument ? Error::kEngineBadRequest : error.Code();
}

/// The command that a part names. @throws Error for a part of another shape and for an unknown command.
const Command& KnownCommand(const Json::Value& part) {
  const bool shaped = part.isObject() && part["command"].isString() && IsJsonObject(part["data"]);
  if (!shaped) throw Error(Error::kEngineBadRequest, kShapeText);
  const Command* command = FindCommand(part["command"].asString());
  if (command == nullptr) {
    throw Error(Error::kEngineUnknownCommand, "there is no command \"" +
                                                  part["command"].asString().substr(0, kNameShownBytes) +
                                                  "\"; see the list in docs/formats/engine.md");
  }
  return *command;
}

/// A part's "data", an empty object where it has none.
Json::Value& DataOf(Json::Value& part) {
  Json::Value& data = part["data"];
  if (data.isNull()) data = Json::Value(Json::objectValue);
  return data;
}

/// @throws Error kInternal.
uint32_t OwnerOfInstance() {
  const std::optional<uid_t> owner = services::InstanceOwner();
  FERROX_FAIL_IF(!owner.has_value(), Error::kInternal, "cannot tell whose instance this is: " + ErrnoText());
  return *owner;
}

/// Runs `run` and turns what it throws into a failure reply.
template <typename Run>
Json::Value ReplyOf(const Caller& caller, Run run) {
  try {
    return run();
  } catch (const Error& error) {
    return FailureReply(ReplyCode(error), caller.privileged ? error.what() : SentenceForUsers(error));
  } catch (const Json::Exception& error) {
    return FailureReply(Error::kEngineBadRequest, std::string("the request cannot be read: ") + error.what());
  } catch (const std::bad_alloc&) {
    return FailureReply(Error::kEngineBusyMemory, "the engine is short of memory; ask again later");
  }
}

void WaitForStep(std::chrono::steady_clock::time_point began) {
  const auto steps = (std::chrono::steady_clock::now() - began) / Engine::kStep + 1;
  std::this_thread::sleep_until(began + steps * Engine::kStep);
}

bool Failed(const Json::Value& reply) { return !reply["success"].asBool(); }

}  // namespace

/// The reply to a compound, as a text from the beginning: it has as many entries as the request has parts.
class CompoundReply {
 public:
  void Add(const Json::Value& answer) {
    has_fail_ = has_fail_ || Failed(answer);
    std::string text = toString(answer);
    if (entries_.size() + text.size() > kReplyMaxBytes && !Failed(answer) && answer.isMember("data")) {
      text = toString(FailureReply(Error::kEngineBadRequest, "the reply is too long; ask for less at once"));
      has_fail_ = true;
    }
    entries_ += (entries_.empty() ? "" : ",") + text;
  }
  std::string Text() const {
    return "{\"data\":[" + entries_ + "],\"has_fail\":" + (has_fail_ ? "true" : "false") + ",\"success\":true}";
  }

 private:
  std::string entries_;
  bool has_fail_ = false;
};

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

Engine::Engine(const std::string& state_folder, LookFunction look, UserSources users, SynonymsFunction synonyms)
    : registry_(state_folder),
      instance_owner_(OwnerOfInstance()),
      look_(std::move(look)),
      synonyms_(std::move(synonyms)),
      users_(std::move(users), instance_owner_) {}

std::string Engine::Handle(const std::string& request, const services::Peer& peer) {
  const auto began = std::chrono::steady_clock::now();
  const Caller caller = CallerOf(peer, instance_owner_);
  std::string text;
  const Json::Value failure = ReplyOf(caller, [&] {
    std::optional<WorkLimit> limit;
    if (!caller.privileged) limit.emplace(kUserWorkLongest);
    text = Answer(request, caller);
    return Json::Value();
  });
  registry_.HealDamaged();
  if (!caller.privileged) WaitForStep(began);
  return failure.isNull() ? text : toString(failure);
}

/// @throws Error kEngineNotPermitted.
void Engine::RequireRights(const Command& command, const Caller& caller) const {
  if (caller.privileged) return;
  if (instance_owner_ != 0) {
    throw UserError(Error::kEngineNotPermitted, "this is an instance of user " + std::to_string(instance_owner_) +
                                                    " alone, and answers nobody else but root");
  }
  if (command.users != Users::kPrivileged) return;
  throw UserError(Error::kEngineNotPermitted, "user " + std::to_string(caller.uid) + " may not use \"" + command.name +
                                                  "\"; only root and the owner of the instance may");
}

/// All parts of a compound are checked for shape and rights before the first is carried out.
std::string Engine::Answer(const std::string& request, const Caller& caller) {
  const auto members = JsonMembers(request, kMembersMax);
  if (members.has_value() && members->size() == 1 && members->front().name == "\"compound\"") {
    if (!caller.privileged) throw UserError(Error::kEngineNotPermitted, kNoCompoundText);
    CompoundParts parts(members->front().value, [](const Json::Value& part) { (void)KnownCommand(part); });
    return AnswerCompound(parts, caller);
  }
  Json::Value parsed = ParseCommand(request);
  if (parsed.isMember("compound")) throw Error(Error::kEngineBadRequest, kShapeText);
  const Command& command = KnownCommand(parsed);
  RequireRights(command, caller);
  return toString(Run(command, caller, parsed));
}

/// The user whom "as" names; null where it names none, or the caller may not name one, which AskerOf refuses.
NamedUserPtr Engine::NamedBy(const Command& command, const Caller& caller, const Json::Value& data) {
  const Json::Value& as = data["as"];
  if (!as.isObject() || !as.isMember("user")) return nullptr;
  const bool may = caller.privileged ? command.users != Users::kPrivileged
                                     : command.users == Users::kEveryoneAndFor && IsTrusted(caller.uid);
  if (!may) return nullptr;
  if (as.size() != 1) RefuseMember("as", "an object with \"user\" alone, or with \"uid\" and \"groups\"");
  return users_.Find(as["user"], NamesInRules(registry_.List()));
}

/// Who asks as an ordinary user is told of failures what that user is.
Json::Value Engine::Run(const Command& command, const Caller& caller, Json::Value& part) {
  CommandCall call{registry_, caller, look_, synonyms_, relay_, DataOf(part)};
  const bool as_user = command.users != Users::kPrivileged && !call.data["as"].isNull();
  try {
    call.named = NamedBy(command, caller, call.data);
    std::optional<NamedUsers::Turn> turn;
    if (call.named != nullptr && !caller.privileged) turn.emplace(users_, call.named->uid);
    return SuccessReply(command.run(call));
  } catch (const Error& error) {
    if (!as_user) throw;
    throw UserError(error.Code(), SentenceForUsers(error));
  }
}

/// The parts in order; neighbours that change documents of one index are carried out in one go.
std::string Engine::AnswerCompound(CompoundParts& parts, const Caller& caller) {
  CompoundReply reply;
  bool suggestions_done = false;
  while (!parts.AtEnd()) {
    if (IsDocumentChange(parts.Front()["command"].asString())) {
      AnswerChanges(parts, caller, reply);
      continue;
    }
    Json::Value part = parts.Take();
    const std::string name = part["command"].asString();
    // One rebuilding serves all the documents that are named.
    const bool repeated = name == "update_term_suggestion" && suggestions_done;
    const Json::Value answer =
        repeated ? SuccessReply(Json::Value()) : ReplyOf(caller, [&] { return Run(*FindCommand(name), caller, part); });
    suggestions_done = suggestions_done || (name == "update_term_suggestion" && !Failed(answer));
    reply.Add(answer);
  }
  return reply.Text();
}

/// Carries out the next changes that are for the same index, in one turn of its thread: a compound of ten thousand
/// documents waits for the thread once. A change that is refused does not keep the others from being made; a failure of
/// the store ends them all.
void Engine::AnswerChanges(CompoundParts& compound, const Caller& caller, CompoundReply& reply) {
  const Json::Value id = compound.Front()["data"]["id"];
  std::vector<Json::Value> parts = compound.TakeWhile([&id](const Json::Value& part) {
    return IsDocumentChange(part["command"].asString()) && part["data"]["id"] == id;
  });
  std::vector<std::optional<DocumentChange>> changes(parts.size());
  std::vector<Json::Value> failures(parts.size());
  std::shared_ptr<Index> index;
  for (size_t i = 0; i < parts.size(); ++i) {
    failures[i] = ReplyOf(caller, [&] {
      Json::Value& data = DataOf(parts[i]);
      const Registry::OpenIndex open = registry_.Open(RequiredText(data, "id"));
      changes[i] = ReadDocumentChange(parts[i]["command"].asString(), open, data);
      index = open.index;
      return Json::Value();
    });
  }
  if (index != nullptr) {
    index->Write([&](IndexStore& store) {
      for (size_t i = 0; i < changes.size(); ++i) {
        if (!changes[i].has_value()) continue;
        try {
          Apply(store, *changes[i]);
        } catch (const Error& error) {
          if (error.Code() == Error::kEngineStorage) throw;
          failures[i] = FailureReply(ReplyCode(error), error.what());
        }
      }
    });
  }
  for (const Json::Value& failure : failures) reply.Add(failure.isNull() ? SuccessReply(Json::Value()) : failure);
}

}  // namespace ferrox::engine
