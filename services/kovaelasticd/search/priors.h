#pragma once

#include <cstdint>
#include <string>
#include <unordered_map>
#include <unordered_set>
#include <vector>

#include "services/kovaelasticd/query/query.h"
#include "services/kovaelasticd/store/index_store.h"
#include "services/kovaelasticd/store/store_reader.h"

namespace ferrox::engine {

/// What of a document's row counts for its score beside words.
struct RankedRow {
  int64_t folder = 0;  ///< that it lies in
  int64_t mtime = 0;   ///< seconds since the epoch
  int32_t kind = 0;
  std::string ext;
};

/// The values of Priors, in the measure of scores: a word that one document in a hundred has adds about five.
struct PriorConstants {
  double recent = 0.3;            ///< of a file that was changed today,
  double recent_half_days = 180;  ///< half of it for one of so many days
  double high = 0.2;              ///< of a file without a folder above,
  double high_half_depth = 4;     ///< half of it below so many
  double asked_for = 1.0;         ///< it is of a kind that a word of the query names
  // Some folder above is of a kind whose files are seldom meant; the lowest of them counts.
  double in_backup = -0.5;
  double in_build = -0.3;
  double in_hidden = -0.5;
  double in_cache = -0.8;
  double in_trash = -0.8;
  double in_packages = -0.8;
  double in_versions = -0.8;
};

/// What a document is worth for a query before any word is looked at: little, so that words decide among documents that
/// differ in them. It follows from the document's path, date and kind. For one search.
class Priors {
 public:
  /// `reader` must outlive this. @throws Error kEngineStorage.
  Priors(StoreReader& reader, const QueryNode& query);

  /// What is added to the score; to `parts`, unless null, what it is made of. @throws Error kEngineStorage.
  double Of(const RankedRow& row, std::vector<ScorePart>* parts);

 private:
  /// What the folders on a document's way say.
  struct Way {
    double depth = 0;            ///< how many they are
    double value = 0;            ///< of the one that is worth least; 0: none of them is special
    const char* what = nullptr;  ///< what that one is
  };
  void CollectWords(const QueryNode& node);
  void AskFor(const std::string& word);
  double Recency(int64_t mtime) const;
  Way WayTo(int64_t folder);
  void Judge(const std::string& name, Way& way) const;

  StoreReader& reader_;
  const PriorConstants constants_;
  const int64_t now_;
  std::unordered_set<std::string> words_;  ///< of the query, folded, but for those behind NOT
  std::unordered_set<int32_t> kinds_;      ///< that they name, as the extensions
  std::unordered_set<std::string> extensions_;
  std::unordered_map<int64_t, Way> ways_;  ///< by folder
};

}  // namespace ferrox::engine
