#include "services/kovaelasticd/search/relevance.h"

#include <algorithm>
#include <iterator>
#include <numeric>
#include <string_view>
#include <tuple>
#include <utility>

#include "services/kovaelasticd/store/fts.h"
#include "services/kovaelasticd/store/work_limit.h"

namespace ferrox::engine {

namespace {

/// Documents whose order is settled by the close score lie in blocks of this many in the order of the quick score. The
/// blocks are the same whichever page is asked for, so pages neither repeat nor miss a hit; a page reads the lengths
/// and dates of the one to three blocks that it touches, about 1 ms each.
constexpr size_t kCloseBlock = 500;

/// Finds the hits of a word among the candidates, both in the order of documents, by walking through both once; calls
/// `take` with the candidate and the hit.
template <typename Candidate, typename Take>
void ForEachCandidateHit(std::vector<Candidate>& candidates, const std::vector<TermHit>& hits, Take take) {
  size_t place = 0;
  for (const TermHit& hit : hits) {
    while (place < candidates.size() && candidates[place].id < hit.id) ++place;
    if (place == candidates.size()) return;
    if (candidates[place].id == hit.id) take(candidates[place], hit);
  }
}

/// The constants for a query of these words.
RankingConstants ForWords(RankingConstants constants, const std::vector<RankedWord>& words) {
  const auto telling =
      std::count_if(words.begin(), words.end(), [](const RankedWord& word) { return !word.is_function; });
  const double share = std::min(1.0, constants.long_query / std::max(1.0, static_cast<double>(telling)));
  for (double* const value : {&constants.in_title, &constants.near_text, &constants.near_title}) *value *= share;
  return constants;
}

}  // namespace

RelevanceRanking::RelevanceRanking(StoreReader& reader, const Visible& visible, const std::vector<RankedWord>& words,
                                   const SearchRequest& request, const RankingConstants& constants)
    : database_(reader.database),
      visible_(visible),
      ties_(reader, visible),
      words_(words),
      average_text_(std::max(
          1.0, static_cast<double>(visible.TextBytes()) / std::max(1.0, static_cast<double>(visible.WithContent())))),
      ranked_max_(request.ranked_max),
      constants_(ForWords(constants, words)),
      value_(constants_),
      nearness_(reader.database, words, constants_),
      priors_(reader, *request.query) {}

/// The documents to rank: all; or, with more than ranked_max_ of them, those added last (for an asker those with the
/// least PathKeys) and all that have a word in their name, title or fields. `bounded` becomes whether some were left
/// out.
std::vector<RelevanceRanking::Candidate> RelevanceRanking::Candidates(const DocSet& documents, int64_t total,
                                                                      bool& bounded) const {
  std::vector<Candidate> candidates;
  const int64_t skip = std::max<int64_t>(0, total - static_cast<int64_t>(ranked_max_));
  bounded = skip > 0;
  WorkLimit::Require(static_cast<size_t>(total - skip) * (sizeof(Candidate) + words_.size()));
  candidates.reserve(static_cast<size_t>(total - skip));
  DocSet by_name;
  if (bounded) {
    for (const RankedWord& word : words_) {
      for (const TermHit& hit : word.hits) {
        if ((hit.places | hit.other_places) != 0) by_name.Add(hit.id);
      }
    }
  }
  const bool by_key = bounded && visible_.IsForAsker();
  LeastKeys keys(ranked_max_);
  documents.ForEach([&](int64_t id) {
    if (by_key) keys.Add(visible_.PathKey(id));
    return by_key;
  });
  const uint64_t bound = keys.Bound();
  int64_t place = 0;
  documents.ForEach([&](int64_t id) {
    const bool is_among = by_key ? visible_.PathKey(id) <= bound : place++ >= skip;
    if (is_among || by_name.Contains(id)) candidates.push_back({id, 0});
    return true;
  });
  return candidates;
}

/// Scores all candidates by the words' hits alone, without reading a row: texts count as of average length.
void RelevanceRanking::ScoreQuickly(std::vector<Candidate>& candidates) const {
  for (const RankedWord& word : words_) {
    ForEachCandidateHit(candidates, word.hits, [&](Candidate& candidate, const TermHit& hit) {
      candidate.score += static_cast<float>(value_.Of(word, hit, DocumentShape()));
    });
    const auto by_folder = static_cast<float>(value_.OfFolder(word));
    if (word.folders.SizeBytes() == 0) continue;
    for (Candidate& candidate : candidates) {
      if (word.folders.Contains(candidate.id)) candidate.score += by_folder;
    }
  }
}

/// PathKeys of the candidates where these decide, else none.
std::vector<uint64_t> RelevanceRanking::Keys(const std::vector<Candidate>& candidates) const {
  std::vector<uint64_t> keys;
  if (!visible_.IsForAsker() || candidates.size() <= kCloseBlock) return keys;
  keys.reserve(candidates.size());
  for (const Candidate& candidate : candidates) keys.push_back(visible_.PathKey(candidate.id));
  return keys;
}

/// The candidates that stand from `begin` to `end` in the order of the quick score, in no order.
std::vector<int64_t> RelevanceRanking::DocumentsBetween(const std::vector<Candidate>& candidates,
                                                        const std::vector<uint64_t>& keys, size_t begin, size_t end) {
  std::vector<size_t> places(candidates.size());
  std::iota(places.begin(), places.end(), size_t{0});
  const auto better = [&](size_t a, size_t b) {
    if (candidates[a].score != candidates[b].score) return candidates[a].score > candidates[b].score;
    return keys.empty() ? a > b : ties_.KeyComesFirst(candidates[a].id, keys[a], candidates[b].id, keys[b]);
  };
  const auto first = places.begin() + static_cast<ptrdiff_t>(begin);
  const auto last = places.begin() + static_cast<ptrdiff_t>(end);
  if (last != places.end()) std::nth_element(places.begin(), last, places.end(), better);
  if (first != last) std::nth_element(places.begin(), first, last, better);
  std::vector<int64_t> documents;
  for (auto place = first; place != last; ++place) documents.push_back(candidates[*place].id);
  return documents;
}

/// What the document's row tells: its length, and the letters of its name without the extension. Returns what it is
/// worth whatever the words are.
double RelevanceRanking::ReadRow(int64_t id, DocumentShape& shape, size_t& name_letters,
                                 std::vector<ScorePart>* parts) {
  Statement statement = database_.Prepare("SELECT text_bytes, mtime, folder, kind, ext, name FROM docs WHERE id = ?1");
  name_letters = 0;
  if (!statement.Bind(1, id).Step()) return 0;
  RankedRow row;
  row.mtime = statement.Int(1);
  row.folder = statement.Int(2);
  row.kind = static_cast<int32_t>(statement.Int(3));
  row.ext = statement.Text(4);
  const std::string_view name = statement.Text(5);
  name_letters = CountLetters(name.substr(0, name.size() - std::min(name.size(), row.ext.size())));
  shape.length = value_.Length(static_cast<double>(statement.Int(0)) / average_text_);
  return priors_.Of(row, parts);
}

/// The score without nearness; to `parts`, unless null, what it is made of.
double RelevanceRanking::CloseScore(int64_t id, std::vector<ScorePart>* parts) {
  DocumentShape shape;
  size_t name_letters = 0;
  double score = ReadRow(id, shape, name_letters, parts);
  std::vector<std::pair<const RankedWord*, const TermHit*>> hits;
  size_t letters = 0;
  size_t in_name = 0;
  for (const RankedWord& word : words_) {
    const auto before = [](const TermHit& hit, int64_t document) { return hit.id < document; };
    const auto hit = std::lower_bound(word.hits.begin(), word.hits.end(), id, before);
    if (hit != word.hits.end() && hit->id == id) {
      hits.emplace_back(&word, &*hit);
      if (((hit->places | hit->other_places) & kInName) != 0) letters += word.letters, ++in_name;
    }
    if (!word.folders.Contains(id)) continue;
    score += value_.OfFolder(word);
    if (parts != nullptr) parts->push_back({word.word, "folder", value_.OfFolder(word)});
  }
  shape.of_name =
      name_letters == 0 ? 0 : std::min(1.0, static_cast<double>(letters) / static_cast<double>(name_letters));
  shape.is_name = shape.of_name >= 1 && in_name == words_.size();
  for (const auto& [word, hit] : hits) {
    score += value_.Of(*word, *hit, shape);
    if (parts != nullptr) value_.Explain(*word, *hit, shape, *parts);
  }
  return score;
}

/// The block of documents sorted by the close score; only what stands from `begin` to `end` in it is wanted.
std::vector<RankedDocument> RelevanceRanking::RankBlock(std::vector<int64_t> documents, size_t begin, size_t end) {
  std::sort(documents.begin(), documents.end());
  const std::vector<double> near = nearness_.Of(documents);
  std::vector<RankedDocument> ranked;
  ranked.reserve(documents.size());
  for (size_t i = 0; i < documents.size(); ++i) {
    ranked.emplace_back(documents[i]).score = CloseScore(documents[i], nullptr) + near[i];
  }
  const auto better = [](const RankedDocument& a, const RankedDocument& b) { return a.score > b.score; };
  std::sort(ranked.begin(), ranked.end(), better);
  const auto wanted = ranked.begin() + static_cast<ptrdiff_t>(end);
  for (auto equal = ranked.begin() + static_cast<ptrdiff_t>(begin); equal < wanted;) {
    const auto [first, last] = std::equal_range(ranked.begin(), ranked.end(), *equal, better);
    ties_.Sort(first, last);
    equal = last;
  }
  return {std::make_move_iterator(ranked.begin() + static_cast<ptrdiff_t>(begin)), std::make_move_iterator(wanted)};
}

std::vector<ScorePart> RelevanceRanking::Explain(int64_t id) {
  std::vector<ScorePart> parts;
  (void)CloseScore(id, &parts);
  const double near = nearness_.Of({id}).front();
  if (near > 0) parts.push_back({"words close together", "", near});
  std::stable_sort(parts.begin(), parts.end(), [](const ScorePart& a, const ScorePart& b) { return a.adds > b.adds; });
  return parts;
}

/// The page itself: of all candidates, best first, those from `offset` on; the other way round, counted from the end.
std::vector<RankedDocument> RelevanceRanking::Page(const DocSet& documents, int64_t total, const PageOrder& order,
                                                   bool& bounded) {
  std::vector<Candidate> candidates = Candidates(documents, total, bounded);
  ScoreQuickly(candidates);
  const std::vector<uint64_t> keys = Keys(candidates);
  const size_t count = candidates.size();
  size_t begin = std::min(count, order.begin);
  size_t end = std::min(count, order.end);
  if (order.ascending) std::tie(begin, end) = std::make_pair(count - end, count - begin);
  std::vector<RankedDocument> page;
  for (size_t block = begin / kCloseBlock * kCloseBlock; block < end; block += kCloseBlock) {
    const size_t block_end = std::min(count, block + kCloseBlock);
    std::vector<RankedDocument> ranked = RankBlock(DocumentsBetween(candidates, keys, block, block_end),
                                                   std::max(begin, block) - block, std::min(block_end, end) - block);
    page.insert(page.end(), std::make_move_iterator(ranked.begin()), std::make_move_iterator(ranked.end()));
  }
  if (order.ascending) std::reverse(page.begin(), page.end());
  return page;
}

}  // namespace ferrox::engine
