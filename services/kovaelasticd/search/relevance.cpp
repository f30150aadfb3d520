#include "services/kovaelasticd/search/relevance.h"

#include <algorithm>
#include <iterator>
#include <numeric>
#include <tuple>
#include <utility>

#include "common/clock.h"
#include "services/kovaelasticd/store/work_limit.h"

namespace ferrox::engine {

namespace {

/// Documents whose order is settled by the close score lie in blocks of this many in the order of the quick score. The
/// blocks are the same whichever page is asked for, so pages neither repeat nor miss a hit; a page reads the lengths
/// and dates of the one to three blocks that it touches, about 1 ms each.
constexpr size_t kCloseBlock = 500;

/// What a word's places beside the content add to the score, in the measure of CountValue. The values are set by hand:
/// a word in the name outweighs any number of occurrences in a text.
double PlaceValue(uint8_t places) {
  double value = 0;
  if ((places & kInName) != 0) value += 2.5;
  if ((places & (kInName | kInNamePart)) == kInNamePart) value += 1.0;
  if ((places & kInTitle) != 0) value += 1.5;
  if ((places & kInText) != 0) value += 0.8;
  return value;
}

/// What ages count from, in seconds since the epoch: the same all day, so that pages asked one after the other agree.
int64_t EndOfDay() { return (Clock::Get().Now() / kDaySec + 1) * kDaySec; }

/// What a word's occurrences in the content add to the score: the term of BM25, with k1 = 1.2, which nears 2.2 with
/// many occurrences; the longer the text, the more are needed for the same.
double CountValue(uint8_t count, double length_factor) { return count * 2.2 / (count + 1.2 * length_factor); }

}  // namespace

RelevanceRanking::RelevanceRanking(StoreReader& reader, const Visible& visible, const std::vector<RankedWord>& words,
                                   size_t ranked_max)
    : database_(reader.database),
      visible_(visible),
      ties_(reader, visible),
      words_(words),
      average_text_(std::max(
          1.0, static_cast<double>(visible.TextBytes()) / std::max(1.0, static_cast<double>(visible.WithContent())))),
      ranked_max_(ranked_max) {}

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
      for (const WordHit& hit : word.meta) by_name.Add(hit.id);
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
    if (is_among || by_name.Contains(id)) candidates.push_back({id, 0, 0});
    return true;
  });
  return candidates;
}

/// The length of the document's text in averages of the index, damped: 0.3 for none, 1 for the average. `freshness`
/// becomes what its age adds to the score: 0.3 for a file changed today, half of that for one of 180 days.
double RelevanceRanking::LengthFactor(int64_t id, double& freshness) {
  Statement statement = database_.Prepare("SELECT text_bytes, mtime FROM docs WHERE id = ?1");
  statement.Bind(1, id);
  freshness = 0;
  if (!statement.Step()) return 1;
  const double age_days = std::max(0.0, static_cast<double>(EndOfDay() - statement.Int(1)) / kDaySec);
  freshness = 0.3 / (1 + age_days / 180);
  return 0.3 + 0.7 * static_cast<double>(statement.Int(0)) / average_text_;
}

/// Finds the hits of a word among the candidates, which are in the order of their numbers as the hits of each
/// expression are, by walking through both once; calls `take` with the candidate's place and the hit.
template <typename Take>
void RelevanceRanking::ForEachCandidateHit(const std::vector<Candidate>& candidates, const std::vector<WordHit>& hits,
                                           Take take) {
  size_t place = 0;
  int64_t before = 0;
  for (const WordHit& hit : hits) {
    if (hit.id < before) place = 0;  // the hits of the next phrase begin
    before = hit.id;
    while (place < candidates.size() && candidates[place].id < hit.id) ++place;
    if (place < candidates.size() && candidates[place].id == hit.id) take(place, hit);
  }
}

/// Scores all candidates by the words' hits alone, without reading a row: texts count as of average length. `counts`
/// becomes the words' occurrences in the content, candidate by candidate.
void RelevanceRanking::ScoreQuickly(std::vector<Candidate>& candidates, std::vector<uint8_t>& counts) const {
  counts.assign(candidates.size() * words_.size(), 0);
  for (size_t t = 0; t < words_.size(); ++t) {
    const double weight = words_[t].weight;
    ForEachCandidateHit(candidates, words_[t].content, [&](size_t place, const WordHit& hit) {
      counts[place * words_.size() + t] = hit.count;
      candidates[place].score += static_cast<float>(weight * CountValue(hit.count, 1));
    });
    ForEachCandidateHit(candidates, words_[t].meta, [&](size_t place, const WordHit& hit) {
      const auto value = static_cast<float>(weight * PlaceValue(hit.places));
      candidates[place].score += value;
      candidates[place].place_score += value;
    });
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

/// The places of the candidates that stand from `begin` to `end` in the order of the quick score, in no order.
std::vector<size_t> RelevanceRanking::PlacesBetween(const std::vector<Candidate>& candidates,
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
  return {first, last};
}

/// The score with the length of the text and its age, for which the document's row is read.
double RelevanceRanking::CloseScore(const Candidate& candidate, const uint8_t* counts) {
  double score = 0;
  const double length = LengthFactor(candidate.id, score);
  score += static_cast<double>(candidate.place_score);
  for (size_t t = 0; t < words_.size(); ++t) {
    if (counts[t] > 0) score += words_[t].weight * CountValue(counts[t], length);
  }
  return score;
}

/// The block of candidates at these places, sorted by the close score; only what stands from `begin` to `end` in it is
/// wanted.
std::vector<RankedDocument> RelevanceRanking::RankBlock(const std::vector<Candidate>& candidates,
                                                        const std::vector<uint8_t>& counts,
                                                        const std::vector<size_t>& places, size_t begin, size_t end) {
  std::vector<RankedDocument> ranked;
  ranked.reserve(places.size());
  for (const size_t place : places) {
    RankedDocument entry(candidates[place].id);
    entry.score = CloseScore(candidates[place], counts.data() + place * words_.size());
    ranked.push_back(std::move(entry));
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

/// The page itself: of all candidates, best first, those from `offset` on; the other way round, counted from the end.
std::vector<RankedDocument> RelevanceRanking::Page(const DocSet& documents, int64_t total, const PageOrder& order,
                                                   bool& bounded) {
  std::vector<Candidate> candidates = Candidates(documents, total, bounded);
  std::vector<uint8_t> counts;
  ScoreQuickly(candidates, counts);
  const std::vector<uint64_t> keys = Keys(candidates);
  const size_t count = candidates.size();
  size_t begin = std::min(count, order.begin);
  size_t end = std::min(count, order.end);
  if (order.ascending) std::tie(begin, end) = std::make_pair(count - end, count - begin);
  std::vector<RankedDocument> page;
  for (size_t block = begin / kCloseBlock * kCloseBlock; block < end; block += kCloseBlock) {
    const std::vector<size_t> places = PlacesBetween(candidates, keys, block, std::min(count, block + kCloseBlock));
    std::vector<RankedDocument> ranked =
        RankBlock(candidates, counts, places, std::max(begin, block) - block, std::min(places.size(), end - block));
    page.insert(page.end(), std::make_move_iterator(ranked.begin()), std::make_move_iterator(ranked.end()));
  }
  if (order.ascending) std::reverse(page.begin(), page.end());
  return page;
}

}  // namespace ferrox::engine
