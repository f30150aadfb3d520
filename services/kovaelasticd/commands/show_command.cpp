#include <algorithm>
#include <optional>
#include <string>
#include <utility>
#include <vector>

#include "base/name_rules.h"
#include "base/path.h"
#include "services/kovaelasticd/commands/commands.h"
#include "services/kovaelasticd/commands/entered_shares.h"
#include "services/kovaelasticd/commands/members.h"
#include "services/kovaelasticd/commands/user_error.h"
#include "services/kovaelasticd/commands/user_search.h"
#include "wire/fields.h"

namespace ferrox::engine {

namespace {

/// A share that may hold what is asked for, and the full path that it has there.
struct Candidate {
  const Registry::Listed* index;
  std::string path;
};

/// What `path` may mean: a full path, in the share with the longest root first, or one that begins with a share's name.
std::vector<Candidate> CandidatesFor(const std::string& path, const std::vector<Registry::Listed>& listed) {
  std::vector<Candidate> candidates;
  for (const Registry::Listed& index : listed) {
    if (index.share != nullptr && base::IsAtOrBelow(path, index.share->root)) candidates.push_back({&index, path});
  }
  std::stable_sort(candidates.begin(), candidates.end(), [](const Candidate& a, const Candidate& b) {
    return a.index->share->root.size() > b.index->share->root.size();
  });
  for (const Registry::Listed& index : listed) {
    const std::string named = index.share == nullptr ? "" : "/" + index.share->share;
    if (named.empty() || !base::IsAtOrBelow(path, named)) continue;
    const std::string& root = index.share->root;
    candidates.push_back({&index, (root == "/" && path != named ? "" : root) + path.substr(named.size())});
  }
  return candidates;
}

/// The document at `path` with all its fields, and with its text when that is asked for; null when there is none.
Json::Value LoadDocument(Index& index, const std::string& path, bool with_text) {
  Json::Value document;
  GetRequest request;
  request.term = path;
  index.Read([&](IndexStore& store) {
    store.Get(request, [&document](Json::Value entry) { document = std::move(entry); });
    if (!with_text || document.isNull()) return;
    request.fields = {field::kTextContent};
    store.Get(request, [&document](const Json::Value& text) {
      if (text.isMember(field::kTextContent)) document[field::kTextContent] = text[field::kTextContent];
    });
  });
  return document;
}

/// By the share's rules, for users by name; `path` lies in the share. A name that is only hidden is shown to who knows
/// it.
bool IsVetoed(const ShareNote& note, const std::string& path) {
  return !note.names.has_value() || base::NameRules(note.names->vetoed).MatchAnyIn(path.substr(note.root.size()));
}

/// The document, where the asker may see it: it has an access record, the share can be entered and searched, and the
/// file on the disk is the one that was indexed, and can be read. The disk is looked at first, whatever is there.
Json::Value ShowTo(const CommandCall& call, Asker asker, const Candidate& candidate, bool with_text) {
  const Registry::Listed& index = *candidate.index;
  asker = AskerIn(call, std::move(asker), *index.share);
  const std::vector<wire::LiveFile> live = call.look(asker, {asker.share_root, candidate.path});
  if (live.size() != 2 || !IsLetIn(call, index.share.get(), live[0]) || !live[1].readable) return {};
  if (call.named != nullptr && IsVetoed(*index.share, candidate.path)) return {};
  const EnteredShare share{index.id, index.share, index.paused, asker};
  const Json::Value document = LoadDocument(*OpenForUser(call, share).index, candidate.path, with_text);
  if (!document.isMember(field::kAccess) || !document[fileindex::elastic::k_KOVAStamp].isString()) return {};
  const bool is_folder = document[field::kIsDir].isBool() && document[field::kIsDir].asBool();
  if (!IsSameAndReadable(document[fileindex::elastic::k_KOVAStamp].asString(), is_folder, live[1])) return {};
  return document;
}

/// The same for those who see everything.
Json::Value ShowAll(const CommandCall& call, const Candidate& candidate, bool with_text) {
  return LoadDocument(*call.registry.Open(candidate.index->id).index, candidate.path, with_text);
}

/// What can be shown; null for whatever reason it cannot. That the rights cannot be told fails all alike.
Json::Value Find(const CommandCall& call, const std::string& path, bool with_text) {
  const std::optional<Asker> asker = AskerOf(call.caller, call.data, call.named);
  const std::vector<Registry::Listed> listed = call.registry.List();
  const std::vector<Candidate> candidates = CandidatesFor(path, listed);
  if (asker.has_value() && candidates.empty()) (void)call.look(Asker{asker->uid, asker->groups, "/"}, {"/", "/"});
  for (const Candidate& candidate : candidates) {
    try {
      Json::Value document =
          asker.has_value() ? ShowTo(call, *asker, candidate, with_text) : ShowAll(call, candidate, with_text);
      if (!document.isNull()) return document;
    } catch (const Error& error) {
      if (!asker.has_value() || error.Code() == Error::kEngineRightsUnknown) throw;
    }
  }
  return {};
}

}  // namespace

Json::Value RunShow(CommandCall& call) {
  const std::string asked = CheckedPath("path", RequiredText(call.data, "path"));
  const std::string path = asked.substr(0, std::max<size_t>(1, asked.find_last_not_of('/') + 1));
  Json::Value document = Find(call, path, OptionalBool(call.data, "text", false));
  if (document.isNull()) {
    throw UserError(Error::kEngineNoSuchDocument, "\"" + asked + "\" is not in the index, or you may not read it");
  }
  Json::Value result;
  result["document"] = FieldsForUsers(std::move(document));
  return result;
}

}  // namespace ferrox::engine
