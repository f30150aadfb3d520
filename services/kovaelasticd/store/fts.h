#pragma once

#include <cstdint>
#include <limits>
#include <string>
#include <vector>

#include "services/kovaelasticd/store/doc_set.h"
#include "services/kovaelasticd/store/sqlite_db.h"
#include "services/kovaelasticd/store/visible.h"
#include "services/kovaelasticd/store/work_limit.h"

namespace ferrox::engine {

/// The columns of the full-text table meta_fts; content_fts has one, the body.
enum MetaColumn : int { kGramsColumn, kNameColumn, kTitleColumn, kTextColumn, kFieldsColumn };

/// Where a search word stands in a document, beside its content.
enum HitPlace : uint8_t { kInNamePart = 1, kInName = 2, kInTitle = 4, kInText = 8 };

/// One document that a word was found in. Hundreds of thousands of them are kept for a frequent word.
struct WordHit {
  uint32_t id;
  uint8_t count;   ///< how often it stands in the content, at most kCountMax
  uint8_t places;  ///< a set of HitPlace
};
constexpr uint8_t kCountMax = 32;

/// Collects the visible documents that full-text expressions find: all of them in a set, and of each expression's about
/// `hits_max` one by one, with their counts: those added to the index last; for an asker those with the least PathKeys.
class HitCollector {
 public:
  /// `visible` must outlive this. `hits_max` may be 0.
  HitCollector(size_t hits_max, const Visible& visible)
      : hits_max_(hits_max), shorten_at_(2 * hits_max), visible_(visible) {}
  HitCollector(const HitCollector&) = delete;
  HitCollector& operator=(const HitCollector&) = delete;
  ~HitCollector();
  /// Ends the walk through an expression's documents as soon as more than `documents` visible ones are in the set,
  /// which does not have all then.
  void StopAfter(int64_t documents) { documents_max_ = documents; }
  bool HasStopped() const { return documents_ > documents_max_; }
  /// Documents come in ascending order, phrase by phrase. @return whether further ones are wanted (StopAfter), and
  /// there is time and memory for them (WorkLimit).
  bool Add(int64_t id, uint8_t count, uint8_t places) {
    if (++seen_ % kLookEvery == 0 && WorkLimit::IsOver()) return false;
    if (!visible_.Contains(id)) return true;
    ++seen_visible_;
    if (!set_.Contains(id)) {
      set_.Add(id);
      if (++documents_ > documents_max_) return false;
    }
    if (hits_max_ == 0) return true;
    if (hits_.size() >= shorten_at_) Shorten();
    if (hits_.size() == hits_.capacity() && !Grow()) return false;
    hits_.push_back({static_cast<uint32_t>(id), count, places});
    return true;
  }
  const DocSet& Set() const { return set_; }
  /// How many documents are in the set.
  int64_t Documents() const { return documents_; }
  /// How often Add was called: the work that it was.
  size_t Seen() const { return seen_; }
  int64_t SeenVisible() const { return seen_visible_; }
  DocSet TakeSet() { return std::move(set_); }
  /// Those since the last call, in ascending order of documents; those of several phrases follow each other.
  std::vector<WordHit> TakeHits();

 private:
  static constexpr size_t kLookEvery = 1024;

  void Shorten();
  bool Grow();

  const size_t hits_max_;
  size_t shorten_at_;
  size_t seen_ = 0;
  int64_t seen_visible_ = 0;
  int64_t documents_ = 0;
  int64_t documents_max_ = std::numeric_limits<int64_t>::max();
  const Visible& visible_;
  DocSet set_;
  std::vector<WordHit> hits_;
  size_t held_bytes_ = 0;  ///< of the hits, as WorkLimit counts them, until they are taken
};

/// Makes our tokenizer ("kova") and the function kova_collect known to a connection.
void RegisterFullText(Database& database);

/// The expression for the words as a phrase, in the full-text language; `prefix` holds for the last one.
std::string PhraseExpression(const std::vector<std::string>& words, bool prefix);

/// Hands every document that the expression finds in the full-text table `table` to `collector`. `prefix` tells that it
/// looks for the beginning of a word.
void Collect(Database& database, const char* table, const std::string& expression, bool prefix,
             HitCollector& collector);

/// Whether the expression finds the one document; "" finds none.
bool HasExpression(Database& database, const char* table, const std::string& expression, int64_t id);

}  // namespace ferrox::engine
