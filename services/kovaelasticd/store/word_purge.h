#pragma once

#include <cstdint>
#include <string>
#include <string_view>
#include <vector>

#include "services/kovaelasticd/store/doc_set.h"
#include "services/kovaelasticd/store/fts_pages.h"
#include "services/kovaelasticd/store/sqlite_db.h"

namespace ferrox::engine {

/// Takes the words of many documents out of a full-text table without their texts: it goes through the pages that FTS5
/// keeps its lists in (the table "<name>_data"), and leaves out the entries of these documents. A page costs some 40
/// us, whatever is on it; FTS5's own 'delete' costs a millisecond for as many words as fill a page.
///
/// Terms and pages stay where they are, so that FTS5 finds them as before. Where a list would have no entry left on a
/// page, or the page would begin with another one than FTS5 has noted elsewhere, the entry becomes what 'delete' leaves
/// behind: one without places, which searches pass over and merges drop. FTS5's own counts of rows and words, which
/// only its ranking reads, are left as they are.
///
/// Between two turns the table may be written to as usual; segments that FTS5 made since are gone through, too. For the
/// thread that writes; members throw Error kEngineStorage.
class WordPurge {
 public:
  enum class Result { kMore, kDone, kUnknownFormat };
  /// `table` is the full-text table. `database` must outlive this.
  WordPurge(Database& database, const std::string& table) : pages_(database, table) {}

  /// Goes through at most `pages` pages, in the transaction that is open, and takes them from `pages`. `gone` must be
  /// the same for all turns. kUnknownFormat: it met what this class does not know; the table is as good as before.
  Result Turn(const DocSet& gone, int64_t& pages);

 private:
  /// The first page tells whether it is the same one.
  struct Segment : FtsSegment {
    size_t first_page_hash;
    bool operator==(const Segment& other) const = default;
  };

  bool ReadSegments(std::vector<Segment>& segments);
  bool RewritePages(Segment& segment, const DocSet& gone, int64_t& pages);
  bool Rewrite(std::string_view page, const DocSet& gone, std::string& out);
  bool CopyEntries(std::string_view list, bool is_last, bool keep_first, const DocSet& gone, std::string& out);

  FtsPages pages_;
  std::vector<Segment> done_;
  Segment current_ = {};     ///< the one that is gone through
  int64_t next_page_ = 0;    ///< of it
  uint64_t spill_ = 0;       ///< how many bytes of the last entry follow on the next page
  bool spill_gone_ = false;  ///< they are left out
};

}  // namespace ferrox::engine
