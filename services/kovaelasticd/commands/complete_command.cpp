#include <algorithm>
#include <optional>
#include <string>
#include <tuple>
#include <utility>
#include <vector>

#include "common/error.h"
#include "services/kovaelasticd/commands/asked_ids.h"
#include "services/kovaelasticd/commands/commands.h"
#include "services/kovaelasticd/commands/entered_shares.h"
#include "services/kovaelasticd/commands/members.h"
#include "services/kovaelasticd/commands/merged_search.h"
#include "services/kovaelasticd/commands/user_error.h"
#include "services/kovaelasticd/commands/user_search.h"
#include "services/kovaelasticd/search/complete.h"
#include "services/kovaelasticd/text/words.h"

namespace ferrox::engine {

namespace {

constexpr int64_t kCompletionsMax = 100;

/// The indices that can be asked; nobody is told of the others, since completion only saves typing.
std::vector<AskedIndex> OpenForCompletion(const CommandCall& call) {
  std::vector<AskedIndex> indices;
  const std::optional<Asker> asker = AskerOf(call.caller, call.data, call.named);
  const auto add = [&indices](auto open) {
    try {
      indices.push_back(open());
    } catch (const Error& error) {
      if (error.Code() == Error::kEngineUserBusy) throw;
    }
  };
  if (asker.has_value()) {
    if (call.data.isMember("id") || call.data.isMember("ids"))
      throw UserError(Error::kEngineNotPermitted, "ordinary users name \"shares\", not indices");
    for (EnteredShare& share : EnteredShares(call, *asker, ReadShareNames(call.data))) {
      add([&] { return AskedIndex{OpenForUser(call, share), std::move(share.asker)}; });
    }
    return indices;
  }
  std::string required;
  for (const std::string& id : AskedIds(call, required)) {
    add([&] { return AskedIndex{call.registry.Open(id)}; });
  }
  return indices;
}

/// Of all indices: the same word's documents are added up.
void Merge(std::vector<Completion>& all, std::vector<Completion> more) {
  for (Completion& completion : more) {
    const auto same =
        std::find_if(all.begin(), all.end(), [&](const Completion& known) { return known.word == completion.word; });
    if (same == all.end()) {
      all.push_back(std::move(completion));
    } else {
      same->documents += completion.documents;
      same->in_name = same->in_name || completion.in_name;
    }
  }
}

/// `text` with its last word, of which `typed` is the folded form and which begins at `begin`, completed; as it was
/// typed where folding did not change its size.
std::string Completed(const std::string& text, size_t begin, const std::string& typed, const std::string& word) {
  return text.size() - begin == typed.size() ? text + word.substr(typed.size()) : text.substr(0, begin) + word;
}

/// Where the last word of `text` begins, which is at its end, and the word itself, folded; "" where there is none.
std::pair<size_t, std::string> LastWord(const std::string& text) {
  WordScanner scanner(text);
  std::pair<size_t, std::string> last;
  while (scanner.Next()) {
    const bool is_last = scanner.End() == text.size() && scanner.WordKind() == WordScanner::Kind::kWord;
    if (is_last) last = {scanner.Begin(), std::string(scanner.Word())};
  }
  return last;
}

}  // namespace

Json::Value RunComplete(CommandCall& call) {
  const std::string text = RequiredText(call.data, "text");
  SearchRequest request;
  request.limit = OptionalInt(call.data, "limit", 10, 1, kCompletionsMax);
  std::vector<AskedIndex> indices = OpenForCompletion(call);
  size_t begin = 0;
  std::tie(begin, request.completed) = LastWord(text);
  std::vector<Completion> found;
  for (AskedIndex& index : indices) {
    if (request.completed.empty()) break;
    request.asker = index.asker.has_value() ? &*index.asker : nullptr;
    try {
      Merge(found, index.open.index->Search(request).completions);
    } catch (const Error& error) {
      if (error.Code() == Error::kEngineUserBusy) throw;
    }
  }
  std::sort(found.begin(), found.end(), &IsBetter);
  if (std::ssize(found) > request.limit) found.resize(static_cast<size_t>(request.limit));
  Json::Value result;
  result["completions"] = Json::Value(Json::arrayValue);
  for (const Completion& completion : found) {
    Json::Value entry;
    entry["text"] = Completed(text, begin, request.completed, completion.word);
    entry["word"] = completion.word;
    entry["documents"] = Json::Int64(completion.documents);
    result["completions"].append(std::move(entry));
  }
  return result;
}

}  // namespace ferrox::engine
