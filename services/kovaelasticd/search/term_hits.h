#pragma once

#include <cstdint>
#include <string>
#include <vector>

#include "services/kovaelasticd/search/ranking_constants.h"
#include "services/kovaelasticd/search/word_forms.h"
#include "services/kovaelasticd/store/doc_set.h"
#include "services/kovaelasticd/store/fts.h"
#include "services/kovaelasticd/store/sqlite_db.h"
#include "services/kovaelasticd/store/visible.h"

namespace ferrox::engine {

/// Where one word of a query stands in one document, in all its forms.
struct TermHit {
  uint32_t id = 0;
  float other = 0;           ///< occurrences in the content of forms that are neither exact nor a stem, by their shares
  uint8_t exact = 0;         ///< occurrences of the word as it is written
  uint8_t stems = 0;         ///< of its stems, which the word itself has mostly too
  uint8_t places = 0;        ///< of the word as it is written: a set of HitPlace
  uint8_t other_places = 0;  ///< of the other forms
  uint8_t other_share = 0;   ///< of the best of these, in parts of 255
  uint8_t related = 0;       ///< n: it has nothing of the word, but of the nth of RankedWord::related
  bool repaired = false;     ///< it has nothing of the word, but of one that this is a misspelling of
};

inline double OtherShare(const TermHit& hit) { return hit.other_share / 255.0; }

/// How often the word stands in the content, each form by its share.
inline double Occurrences(const TermHit& hit, const RankingConstants& constants) {
  const double more_by_stem = hit.stems > hit.exact ? hit.stems - hit.exact : 0;
  return hit.exact + constants.stem * more_by_stem + static_cast<double>(hit.other);
}

/// Collects the visible documents that have a word in one of its forms, and where it stands in them. The hits of few
/// are kept at most (HitCollector); the set is complete.
class TermCollector {
 public:
  TermCollector(Database& database, const Visible& visible, size_t hits_max)
      : database_(database), collector_(hits_max, visible), visible_(visible), hits_max_(hits_max) {}

  void StopAfter(int64_t documents) { collector_.StopAfter(documents); }
  /// Whether it was stopped: what was collected is useless then.
  bool HasStopped() const { return collector_.HasStopped(); }
  /// @throws Error kEngineStorage, as all that follow.
  void Collect(const WordForm& form);
  void Collect(const std::vector<WordForm>& forms) {
    for (const WordForm& form : forms) Collect(form);
  }
  /// Documents that have the text within a word of their name; they do not count for Documents, nor stop anything.
  void CollectNameParts(const std::string& text);
  /// Documents whose name is one that is looked for; they count as those by parts of names do.
  void AddNamed(const DocSet& documents);
  /// What another word, of which this one is a misspelling, was found in, by a share of its worth.
  void AddRepaired(const TermCollector& other, double likelihood, const RankingConstants& constants);
  /// The same of a word that means the same; `number` as in TermHit::related.
  void AddRelated(const TermCollector& other, double share, uint8_t number, const RankingConstants& constants);

  /// Without those by parts of names.
  int64_t Documents() const;
  /// All documents, those by parts of the name too.
  DocSet Set() const;
  /// How often a visible document came, for one word or another.
  int64_t Seen() const { return collector_.SeenVisible(); }
  /// In ascending order.
  std::vector<TermHit> TakeHits() { return std::move(hits_); }

 private:
  template <typename Hit, typename Apply>
  void Merge(const std::vector<Hit>& found, Apply&& apply);
  template <typename Mark>
  void AddOther(const TermCollector& other, double share, const RankingConstants& constants, Mark&& mark);

  Database& database_;
  HitCollector collector_;
  const Visible& visible_;
  const size_t hits_max_;
  DocSet by_name_parts_;
  DocSet of_others_;  ///< of other words
  std::vector<TermHit> hits_;
};

}  // namespace ferrox::engine
