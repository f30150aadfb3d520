#pragma once

#include <cstdint>
#include <memory>
#include <string>

#include "base/name_rules.h"
#include "services/kovaelasticd/store/place_writer.h"
#include "services/kovaelasticd/store/sqlite_db.h"

namespace ferrox::engine {

/// Keeps Place::unseen in line with the patterns of names that an index's share does not show. What is written is
/// marked at once (PlaceWriter); when the patterns change, all places are marked anew, some at a time. The table
/// "name_rules" tells of which patterns the marks are, and whether they are complete.
///
/// For the thread that writes, within its transaction; members throw Error kEngineStorage.
class NameMarks {
 public:
  /// Both must outlive this.
  NameMarks(Database& database, PlaceWriter& places) : database_(database), places_(places) {}

  /// Reads the table; to be called first, and after a rollback.
  void Load();
  /// Whether all places are marked by `rules`, a text of NameRules.
  bool Obey(const std::string& rules) const { return next_ == kNone && rules_ == rules; }
  /// Marks some places by `rules`, for some 50 ms. `version` is that of the next commit.
  void Turn(const std::string& rules, int64_t version);

  /// For a reader: refuses a snapshot whose marks are not those of `rules`, or not complete.
  /// @throws Error kEngineIndexPreparing.
  static void Require(Database& database, const std::string& rules);

 private:
  static constexpr int64_t kNone = -1;

  void Save();

  Database& database_;
  PlaceWriter& places_;
  std::string rules_;
  int64_t next_ = kNone;  ///< the part of the table "locations" that is to be marked next; kNone: all are
};

}  // namespace ferrox::engine
