#pragma once

#include <chrono>
#include <cstdint>
#include <memory>
#include <optional>
#include <vector>

#include "base/mutex.h"
#include "services/kovaelasticd/store/fts_pages.h"
#include "services/kovaelasticd/store/sqlite_db.h"
#include "services/kovaelasticd/store/word_list.h"

namespace ferrox::engine {

/// The words of one index in memory, for all who search it: read from the pages of its full-text tables when a search
/// first needs them, and brought up to date by the pages that were written since. Any thread may call any member.
class WordListCache {
 public:
  using SteadyClock = std::chrono::steady_clock;

  /// The words of the snapshot that `database` has a transaction on, whose version (Totals) is `version`, and perhaps
  /// words of others. Null where they are not all known: reading a large index takes several calls, each of which reads
  /// kTurnPages pages at most, in some 200 ms; and there may be too many of them. Waits while another thread reads.
  /// @throws Error kEngineStorage.
  std::shared_ptr<const WordList> Load(Database& database, int64_t version);
  /// When they were last used; nothing where none are kept.
  std::optional<SteadyClock::time_point> Used() const;
  void GiveBack();

 private:
  static constexpr int64_t kTurnPages = 20000;
  /// 20 MB.
  static constexpr size_t kWordsMax = 1500000;

  /// A segment of which all pages up to `last` are read.
  struct ReadSegment {
    int64_t number;
    int64_t last;
    size_t last_page_hash;
  };
  /// What was read of one full-text table.
  using ReadSegments = std::vector<ReadSegment>;

  std::shared_ptr<const WordList> Latest(int64_t version);
  bool HasTooMany() const BASE_REQUIRES(load_mutex_) { return reading_ != nullptr && reading_->Count() > kWordsMax; }
  /// False where it is not through.
  bool ReadTable(Database& database, const char* table, ReadSegments& read, int64_t& pages) BASE_REQUIRES(load_mutex_);
  void ReadPages(FtsPages& table, ReadSegment& segment, int64_t from, int64_t to) BASE_REQUIRES(load_mutex_);

  base::Mutex load_mutex_;  ///< of who reads from the file; taken before the other
  std::unique_ptr<WordList> reading_ BASE_GUARDED_BY(load_mutex_);  ///< what comes next; null: no more than words_
  ReadSegments content_ BASE_GUARDED_BY(load_mutex_);
  ReadSegments meta_ BASE_GUARDED_BY(load_mutex_);
  mutable base::Mutex mutex_;
  std::shared_ptr<const WordList> words_ BASE_GUARDED_BY(mutex_);  ///< all of `version_` and before
  int64_t version_ BASE_GUARDED_BY(mutex_) = -1;
  std::optional<SteadyClock::time_point> used_ BASE_GUARDED_BY(mutex_);
};

}  // namespace ferrox::engine
