#include "services/kovaelasticd/search/term_hits.h"

#include <algorithm>
#include <utility>

namespace ferrox::engine {

namespace {

uint8_t AddCounts(uint8_t a, uint8_t b) { return static_cast<uint8_t>(std::min(255, a + b)); }
uint8_t InParts(double share) { return static_cast<uint8_t>(255 * share); }

}  // namespace

/// Adds hits, which are in ascending order but for each new phrase, to those that are there.
template <typename Hit, typename Apply>
void TermCollector::Merge(const std::vector<Hit>& found, Apply&& apply) {
  for (size_t begin = 0; begin < found.size();) {
    size_t end = begin + 1;
    while (end < found.size() && found[end].id > found[end - 1].id) ++end;
    std::vector<TermHit> merged;
    merged.reserve(hits_.size() + end - begin);
    size_t before = 0;
    for (; begin < end; ++begin) {
      while (before < hits_.size() && hits_[before].id < found[begin].id) merged.push_back(hits_[before++]);
      if (before < hits_.size() && hits_[before].id == found[begin].id) {
        merged.push_back(hits_[before++]);
      } else {
        merged.emplace_back().id = found[begin].id;
      }
      apply(merged.back(), found[begin]);
    }
    merged.insert(merged.end(), hits_.begin() + static_cast<ptrdiff_t>(before), hits_.end());
    hits_ = std::move(merged);
  }
}

void TermCollector::Collect(const WordForm& form) {
  for (const auto& [table, expression] : {std::pair("content_fts", &form.content), std::pair("meta_fts", &form.meta)}) {
    if (expression->empty() || HasStopped()) continue;
    engine::Collect(database_, table, *expression, form.prefix, collector_);
    if (HasStopped()) continue;
    Merge(collector_.TakeHits(), [&form](TermHit& hit, const WordHit& found) {
      switch (form.kind) {
        case WordForm::Kind::kExact:
          hit.exact = AddCounts(hit.exact, found.count);
          hit.places |= found.places;
          return;
        case WordForm::Kind::kStem:
          hit.stems = AddCounts(hit.stems, found.count);
          break;
        case WordForm::Kind::kOther:
          hit.other += static_cast<float>(form.share * found.count);
          break;
      }
      hit.other_places |= found.places;
      if (found.places != 0) hit.other_share = std::max(hit.other_share, InParts(form.share));
    });
  }
}

void TermCollector::CollectNameParts(const std::string& text) {
  const std::string expression = NamePartExpression(text);
  if (expression.empty()) return;
  HitCollector parts(hits_max_, visible_);
  engine::Collect(database_, "meta_fts", expression, false, parts);
  Merge(parts.TakeHits(), [](TermHit& hit, const WordHit& found) { hit.places |= found.places; });
  by_name_parts_.UniteWith(parts.Set());
}

void TermCollector::AddNamed(const DocSet& documents) {
  HitCollector named(hits_max_, visible_);
  documents.ForEach([&named](int64_t id) { return named.Add(id, 0, kInName); });
  WorkLimit::Check();
  Merge(named.TakeHits(), [](TermHit& hit, const WordHit& found) { hit.places |= found.places; });
  by_name_parts_.UniteWith(documents);
}

/// Calls `mark` for hits of documents that had nothing of the word.
template <typename Mark>
void TermCollector::AddOther(const TermCollector& other, double share, const RankingConstants& constants, Mark&& mark) {
  Merge(other.hits_, [&](TermHit& hit, const TermHit& found) {
    const bool is_new = hit.exact == 0 && hit.stems == 0 && hit.places == 0 && hit.other_places == 0 && hit.other == 0;
    if (is_new) mark(hit);
    hit.other += static_cast<float>(share * Occurrences(found, constants));
    const auto places = static_cast<uint8_t>(found.places | found.other_places);
    hit.other_places |= places;
    if (places != 0) hit.other_share = std::max(hit.other_share, InParts(share));
  });
  of_others_.UniteWith(other.collector_.Set());
}

void TermCollector::AddRepaired(const TermCollector& other, double likelihood, const RankingConstants& constants) {
  AddOther(other, likelihood, constants, [](TermHit& hit) { hit.repaired = true; });
}

void TermCollector::AddRelated(const TermCollector& other, double share, uint8_t number,
                               const RankingConstants& constants) {
  AddOther(other, share, constants, [number](TermHit& hit) { hit.related = number; });
}

int64_t TermCollector::Documents() const {
  DocSet all = collector_.Set();
  all.UniteWith(of_others_);
  return all.Count();
}

DocSet TermCollector::Set() const {
  DocSet all = collector_.Set();
  all.UniteWith(of_others_);
  all.UniteWith(by_name_parts_);
  return all;
}

}  // namespace ferrox::engine
