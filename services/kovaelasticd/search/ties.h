#pragma once

#include <cstddef>
#include <cstdint>
#include <string>
#include <utility>
#include <vector>

#include "services/kovaelasticd/store/store_reader.h"
#include "services/kovaelasticd/store/visible.h"

namespace ferrox::engine {

/// A document in its place among the hits.
struct RankedDocument {
  explicit RankedDocument(int64_t document) : id(document) {}
  int64_t id;
  double score = 0;
  int64_t number_key = 0;  ///< date or size, when hits are ordered by it
  std::string name_key;    ///< the name, when hits are ordered by it
};

/// The order of documents that a search's own order does not tell apart: that of their paths, which are composed for
/// it. Of more than kByPathMax equal ones it is that of their PathKeys for an asker, whom numbers must not tell of
/// other documents; for others it stays as it is.
class Ties {
 public:
  static constexpr size_t kByPathMax = 1000;
  using Iterator = std::vector<RankedDocument>::iterator;

  /// Both must outlive this.
  Ties(StoreReader& reader, const Visible& visible) : reader_(reader), visible_(visible) {}

  /// Brings equals into order. @throws Error kEngineStorage, as all members.
  void Sort(Iterator begin, Iterator end);
  /// The order of more than kByPathMax equals, for an asker.
  bool KeyComesFirst(int64_t a, int64_t b) { return KeyComesFirst(a, visible_.PathKey(a), b, visible_.PathKey(b)); }
  /// The same, of documents whose PathKeys are at hand.
  bool KeyComesFirst(int64_t a, uint64_t a_key, int64_t b, uint64_t b_key) {
    return a_key != b_key ? a_key < b_key : a != b && PathOf(a) < PathOf(b);
  }

 private:
  std::string PathOf(int64_t id);

  StoreReader& reader_;
  const Visible& visible_;
};

/// Of many keys the `most` least ones, or rather the key that bounds them, while they come one by one.
class LeastKeys {
 public:
  explicit LeastKeys(size_t most) : most_(most) {}
  void Add(uint64_t key) {
    keys_.push_back(key);
    if (keys_.size() >= 2 * most_ + 1024) Shorten();
  }
  /// The greatest of the least ones.
  uint64_t Bound();

 private:
  void Shorten();

  const size_t most_;
  std::vector<uint64_t> keys_;
};

}  // namespace ferrox::engine
