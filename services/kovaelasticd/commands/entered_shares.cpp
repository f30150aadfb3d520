#include "services/kovaelasticd/commands/entered_shares.h"

#include <algorithm>

#include "services/kovaelasticd/commands/members.h"
#include "services/kovaelasticd/commands/share_rules.h"
#include "services/kovaelasticd/commands/user_error.h"

namespace ferrox::engine {

namespace {

/// Of more shares than that, those that are meant are all.
constexpr unsigned kSharesMax = 10000;

/// Looks at the share's folder as the asker, who is given its root. Of a folder that is not there, none is entered.
bool CanEnter(const CommandCall& call, const Asker& asker, const ShareNote* note) {
  const std::vector<wire::LiveFile> found = call.look(asker, {asker.share_root});
  return found.size() == 1 && IsLetIn(call, note, found.front());
}

/// Where no index is noted for the name, "/" is looked at in its place: the answer takes as long, and fails when others
/// fail.
std::optional<EnteredShare> EnterNamed(const CommandCall& call, Asker asker,
                                       const std::vector<Registry::Listed>& listed, const std::string& name) {
  const auto has_name = [&name](const Registry::Listed& index) {
    return index.share != nullptr && index.share->share == name;
  };
  const auto found = std::find_if(listed.begin(), listed.end(), has_name);
  asker = AskerIn(call, std::move(asker), found == listed.end() ? ShareNote{"", "/", "", {}} : *found->share);
  const bool entered = CanEnter(call, asker, found == listed.end() ? nullptr : found->share.get());
  if (found == listed.end() || !entered) return std::nullopt;
  return EnteredShare{found->id, found->share, found->paused, std::move(asker)};
}

}  // namespace

std::optional<std::vector<std::string>> ReadShareNames(const Json::Value& data) {
  const Json::Value& member = data["shares"];
  if (member.isNull()) return std::nullopt;
  if (!member.isArray() || member.size() > kSharesMax) RefuseMember("shares", "an array of names of shares");
  std::vector<std::string> names;
  for (const Json::Value& name : member) {
    if (!name.isString()) RefuseMember("shares", "an array of names of shares");
    if (std::find(names.begin(), names.end(), name.asString()) == names.end()) names.push_back(name.asString());
  }
  return names;
}

Asker AskerIn(const CommandCall& call, Asker asker, const ShareNote& note) {
  asker.share_root = note.root;
  if (call.named != nullptr && note.names.has_value()) asker.unseen_names = note.names->unseen;
  return asker;
}

bool IsLetIn(const CommandCall& call, const ShareNote* note, const wire::LiveFile& root) {
  if (!root.entered || note == nullptr) return false;
  return call.named == nullptr || (note->names.has_value() && RulesLetIn(note->rules, *call.named));
}

std::vector<EnteredShare> EnteredShares(const CommandCall& call, const Asker& asker,
                                        const std::optional<std::vector<std::string>>& named) {
  const std::vector<Registry::Listed> listed = call.registry.List();
  std::vector<EnteredShare> entered;
  if (named.has_value()) {
    for (const std::string& name : *named) {
      std::optional<EnteredShare> share = EnterNamed(call, asker, listed, name);
      if (!share.has_value()) RefuseShare(name);
      entered.push_back(std::move(*share));
    }
    return entered;
  }
  for (const Registry::Listed& index : listed) {
    if (index.share == nullptr) continue;
    Asker here = AskerIn(call, asker, *index.share);
    if (CanEnter(call, here, index.share.get()))
      entered.push_back({index.id, index.share, index.paused, std::move(here)});
  }
  return entered;
}

void RefuseShare(const std::string& name) {
  throw UserError(Error::kEngineNoSuchIndex, "there is no share \"" + name + "\" here");
}

}  // namespace ferrox::engine
