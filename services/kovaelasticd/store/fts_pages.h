#pragma once

#include <cstddef>
#include <cstdint>
#include <string>
#include <string_view>
#include <vector>

#include "services/kovaelasticd/store/sqlite_db.h"

namespace ferrox::engine {

// The format of FTS5's pages, which files are bound to as long as "version" in "<name>_config" is 4.
//
// Row 10 of "<name>_data" lists the segments: 4 bytes of a counter, then numbers: levels, segments, pages written; for
// each level, how many of its segments are being merged, how many there are, and of each its number, first and last
// page. A page is a row of its own:
//
//   first list entry that begins on the page without a term before it (2 bytes, 0: none), end of the lists (2 bytes),
//   rest of an entry of the page before, entries, {term, entries}...; at the end the places of terms, as differences
//
// A term is {bytes kept of the one before, unless it is the page's first; length; bytes}. An entry is {document, as
// difference to the one before it, unless it is the first behind a term or the page's first; bytes of places * 2, plus
// 1 for one that is deleted; places}.

inline constexpr size_t kFtsHeaderBytes = 4;

/// Takes numbers off the front, 7 bits a byte with the highest first; the ninth byte has 8.
class FtsNumbers {
 public:
  explicit FtsNumbers(std::string_view bytes) : bytes_(bytes) {}
  bool AtEnd() const { return at_ >= bytes_.size(); }
  size_t At() const { return at_; }
  void Skip(size_t bytes) { at_ += bytes; }
  /// Whether it went beyond the end.
  bool Failed() const { return at_ > bytes_.size(); }
  uint64_t Next() {
    uint64_t value = 0;
    for (int i = 0; i < 9; ++i) {
      if (at_ >= bytes_.size()) {
        at_ = bytes_.size() + 1;
        return 0;
      }
      const auto byte = static_cast<unsigned char>(bytes_[at_++]);
      if (i == 8) return value << 8 | byte;
      value = value << 7 | (byte & 0x7F);
      if ((byte & 0x80) == 0) return value;
    }
    return value;
  }

 private:
  std::string_view bytes_;
  size_t at_ = 0;
};

/// The two numbers at the beginning of a page.
inline size_t FtsNumber16(std::string_view bytes, size_t at) {
  return static_cast<size_t>(static_cast<unsigned char>(bytes[at])) << 8 | static_cast<unsigned char>(bytes[at + 1]);
}

/// Reads the places of the page's terms, and its end behind them. @return false where the page is not as it must be.
bool ReadFtsTermPlaces(std::string_view page, std::vector<size_t>& places);

/// A sorted run of terms, on the pages from `first` to `last`. Pages that are written do not change, unless by a
/// WordPurge; but a segment that others are merged into gets more pages, one that is merged loses its first ones, and
/// numbers are given again.
struct FtsSegment {
  int64_t number;
  int64_t first;
  int64_t last;
  bool operator==(const FtsSegment& other) const = default;
};

/// The pages of one full-text table. Members throw Error kEngineStorage.
class FtsPages {
 public:
  /// `database` must outlive this.
  FtsPages(Database& database, const std::string& table);

  /// @return false where they have a format that is not known here.
  bool ReadSegments(std::vector<FtsSegment>& segments);
  /// "" where there is none.
  std::string ReadPage(int64_t segment, int64_t page);
  void WritePage(int64_t segment, int64_t page, std::string_view bytes);

 private:
  Database& database_;
  const std::string version_;
  const std::string select_;
  const std::string update_;
};

}  // namespace ferrox::engine
