#include "services/kovaelasticd/commands/asked_ids.h"

#include <algorithm>
#include <iterator>
#include <optional>

#include "common/json_util.h"
#include "services/kovaelasticd/commands/entered_shares.h"
#include "services/kovaelasticd/commands/members.h"

namespace ferrox::engine {

namespace {

[[noreturn]] void RefuseIds() { RefuseMember("ids", "an array of index ids"); }

/// The ids of the indices of these shares.
std::vector<std::string> IdsOfShares(const CommandCall& call, const std::vector<std::string>& names) {
  const std::vector<Registry::Listed> listed = call.registry.List();
  std::vector<std::string> ids;
  for (const std::string& name : names) {
    const auto found = std::find_if(listed.begin(), listed.end(), [&name](const Registry::Listed& index) {
      return index.share != nullptr && index.share->share == name;
    });
    if (found == listed.end()) RefuseShare(name);
    ids.push_back(found->id);
  }
  return ids;
}

/// The ids that "ids" has; nothing when it is absent.
std::optional<std::vector<std::string>> ReadIds(const Json::Value& named) {
  if (!IsJsonArray(named)) RefuseIds();
  if (named.isNull()) return std::nullopt;
  std::vector<std::string> ids;
  for (const Json::Value& id : named) {
    if (!id.isString()) RefuseIds();
    ids.push_back(id.asString());
  }
  return ids;
}

}  // namespace

std::vector<std::string> AskedIds(const CommandCall& call, std::string& required) {
  std::vector<std::string> ids;
  if (call.data.isMember("id")) ids.push_back(required = RequiredText(call.data, "id"));
  std::optional<std::vector<std::string>> more = ReadIds(call.data["ids"]);
  if (const auto names = ReadShareNames(call.data); names.has_value()) {
    if (more.has_value() || !ids.empty()) RefuseMember("shares", "given without \"id\" and \"ids\"");
    ids = IdsOfShares(call, *names);
    if (ids.size() == 1) required = ids.front();
    return ids;
  }
  if (more.has_value()) {
    std::move(more->begin(), more->end(), std::back_inserter(ids));
  } else if (ids.empty()) {
    for (const Registry::Listed& listed : call.registry.List()) ids.push_back(listed.id);
  }
  return ids;
}

}  // namespace ferrox::engine
