#pragma once

#include <cstdint>
#include <memory>
#include <utility>
#include <vector>

#include "base/name_rules.h"
#include "services/kovaelasticd/store/places.h"
#include "services/kovaelasticd/store/row_watch.h"
#include "services/kovaelasticd/store/sqlite_db.h"

namespace ferrox::engine {

/// Keeps the table "locations", which repeats where documents and folders lie, whose access they have, how long their
/// texts are, and hashes of their names: their rows are too many, and each too long, to be read for that. A row of it
/// has PlaceList::kPart places, and the version of the commit that changed it last. For the thread that writes, within
/// its transaction; members that read or write throw Error kEngineStorage.
class PlaceWriter {
 public:
  /// `database` must outlive this.
  explicit PlaceWriter(Database& database) : database_(database) {}

  /// Makes the table where it is missing, from all rows.
  void MakeTable();
  /// To be called with each row that changes.
  void OnRow(RowWatch::Table table, int64_t number);
  /// Whether so much has changed that Flush should not wait for the commit.
  bool IsFull() const { return documents_.size() + folders_.size() >= kChangedMax; }
  /// Brings the table up to date; `version` is that of the next commit.
  void Flush(int64_t version);
  /// Which names are marked from now on (Place::unseen).
  void SetNameRules(base::NameRules rules) { name_rules_ = std::make_unique<const base::NameRules>(std::move(rules)); }
  /// Writes the first part anew whose key is `key` or more. @return where to go on; -1: there is none behind it.
  int64_t MarkPart(int64_t key, int64_t version);
  /// Drops the changes, which were rolled back.
  void Forget();

 private:
  static constexpr size_t kChangedMax = 20000;
  /// The list of documents or that of folders.
  struct List {
    int64_t parity;  ///< of its parts' numbers in the table
    const char* one;
    const char* range;
  };
  static const List kDocuments, kFolders;

  void FlushList(const List& list, std::vector<int64_t>& changed, int64_t version);
  void UpdatePart(const List& list, int64_t number, const int64_t* begin, const int64_t* end, int64_t version);
  void PutRow(const Statement& row, int64_t first, PlaceList::Part& part) const;

  Database& database_;
  std::vector<int64_t> documents_;  ///< that have changed
  std::vector<int64_t> folders_;
  std::unique_ptr<const base::NameRules> name_rules_ = std::make_unique<const base::NameRules>("");
};

}  // namespace ferrox::engine
