#include "services/kovaelasticd/search/pattern_search.h"

#include <algorithm>
#include <cstdint>
#include <memory>
#include <optional>
#include <string_view>
#include <utility>
#include <vector>

#include "services/kovaelasticd/search/visible_count.h"
#include "services/kovaelasticd/search/word_forms.h"
#include "services/kovaelasticd/store/fts.h"
#include "services/kovaelasticd/store/word_list.h"
#include "services/kovaelasticd/store/work_limit.h"
#include "services/kovaelasticd/text/fold.h"

namespace ferrox::engine {

namespace {

/// Names of up to so many documents, as a part of all, are read by their rows: a pass over the index of names costs
/// less for more.
constexpr int64_t kByRowPart = 16;
constexpr int64_t kByRowAlways = 1000;
/// The work limit is looked at so often.
constexpr uint64_t kLookEvery = 1024;
/// Letters that a pattern of words gives: of fewer, most words of an index would have to be looked at.
constexpr size_t kGivenLettersMin = 3;

/// Of the words that a pattern stands for: how many there are at most, how many are one expression, so many hits of
/// visible documents end it, and so many of the words are marked in snippets.
constexpr size_t kPatternWordsMax = 500;
constexpr ptrdiff_t kWordsAtOnce = 32;
constexpr int64_t kPatternHitsMax = 2000000;
constexpr size_t kPatternMarksMax = 64;

/// The documents with all parts of the pattern in their names; nothing where it has none that are long enough.
std::optional<DocSet> WithParts(StoreReader& reader, const Visible& visible, const Pattern& pattern) {
  std::optional<DocSet> with;
  for (const std::string& part : pattern.Parts()) {
    HitCollector found(0, visible);
    // Groups of one part stand one behind the other.
    Collect(reader.database, "meta_fts", NamePartExpression(part), false, found);
    if (with.has_value()) {
      with->IntersectWith(found.Set());
    } else {
      with = found.TakeSet();
    }
  }
  return with;
}

struct WordsLike {
  std::vector<std::string> words;  ///< the shortest first; at most kPatternWordsMax
  bool has_more = false;
  bool is_known = true;  ///< false: the words of the index are not, so there are none here
};

/// Whether words of texts are looked for at all.
bool CanBeWord(const Pattern& pattern) {
  const std::string& letters = pattern.Folded();
  const auto given =
      std::count_if(letters.begin(), letters.end(), [](char c) { return c != '*' && c != '?' && (c & 0xC0) != 0x80; });
  return pattern.IsOfLetters() && static_cast<size_t>(given) >= kGivenLettersMin;
}

/// Words that visible documents have.
WordsLike FindWordsLike(StoreReader& reader, const Visible& visible, const Pattern& pattern) {
  WordsLike like;
  if (!CanBeWord(pattern)) return like;
  const std::shared_ptr<const WordList> known = reader.words.Load(reader.database, visible.Version());
  like.is_known = known != nullptr;
  if (!like.is_known) return like;
  std::vector<std::string> matching;
  known->ForEachBeginning(pattern.Beginning(), [&](std::string_view word, bool /*in_several*/) {
    // Only who sees all sees each of them, and needs no more.
    const bool enough = !visible.IsForAsker() && matching.size() > kPatternWordsMax;
    if (!enough && pattern.MatchesWord(word)) matching.emplace_back(word);
  });
  for (std::string& word : matching) {
    WorkLimit::Check();
    if (visible.IsForAsker() && !AnyVisible(reader.database, visible, FormOfAny({word}))) continue;
    like.has_more = like.words.size() == kPatternWordsMax;
    if (like.has_more) break;
    like.words.push_back(std::move(word));
  }
  return like;
}

}  // namespace

DocSet DocumentsNamedLike(StoreReader& reader, const Visible& visible, const Pattern& pattern) {
  DocSet named;
  uint64_t looked = 0;
  const auto look = [&](int64_t id, std::string_view name) {
    if (++looked % kLookEvery == 0) WorkLimit::Check();
    if (pattern.MatchesName(FoldText(name))) named.Add(id);
  };
  const std::optional<DocSet> with_parts = WithParts(reader, visible, pattern);
  if (with_parts.has_value() && with_parts->Count() <= std::max(kByRowAlways, visible.Documents() / kByRowPart)) {
    Statement row = reader.database.Prepare("SELECT name FROM docs WHERE id = ?1");
    with_parts->ForEach([&](int64_t id) {
      row.Reset();
      if (row.Bind(1, id).Step()) look(id, row.Text(0));
      return true;
    });
    return named;
  }
  for (Statement rows = reader.database.Prepare("SELECT id, name FROM docs"); rows.Step();) {
    const int64_t id = rows.Int(0);
    if (with_parts.has_value() ? with_parts->Contains(id) : visible.Contains(id)) look(id, rows.Text(1));
  }
  return named;
}

void CollectWordsLike(StoreReader& reader, const Visible& visible, const TypedPattern& typed, TermCollector& found,
                      FoundWords& words) {
  const WordsLike like = FindWordsLike(reader, visible, typed.pattern);
  const auto hint = [&](const std::string& sentence) { words.hints.push_back("\"" + typed.text + "\" " + sentence); };
  if (!like.is_known) return hint("was looked for in names alone: the words of this index are not at hand");
  size_t at = 0;
  while (at < like.words.size() && found.Seen() < kPatternHitsMax) {
    WorkLimit::Check();
    const auto begin = like.words.begin() + static_cast<ptrdiff_t>(at);
    const auto end = begin + std::min<ptrdiff_t>(kWordsAtOnce, like.words.end() - begin);
    at = static_cast<size_t>(end - like.words.begin());
    found.Collect(FormOfAny({begin, end}));
    for (auto word = begin; typed.is_marked && word != end && words.marked.size() < kPatternMarksMax; ++word) {
      words.marked.push_back({*word, false});
    }
  }
  if (like.has_more || at < like.words.size()) {
    hint("stands for too many words; the " + std::to_string(at) +
         " shortest were looked for in texts: give more letters");
  } else if (!CanBeWord(typed.pattern) && typed.text.find('.') == typed.text.npos) {
    hint("was looked for in names alone; in texts a pattern is one word, with three letters at least, such as rep*t");
  }
}

}  // namespace ferrox::engine
