#pragma once

#include <cstddef>
#include <cstdint>
#include <vector>

namespace ferrox::engine {

/// A set of document numbers, one bit each: 125 KB for a million documents. Numbers are 0 or more and, as new documents
/// get the next one, dense; so joining two sets costs one pass over words of 64 bits.
class DocSet {
 public:
  /// Grows by half when need be: documents are mostly added in ascending order.
  void Add(int64_t id) {
    const auto word = static_cast<size_t>(id) >> 6;
    if (word >= words_.size()) words_.resize(word + word / 2 + 16);
    words_[word] |= uint64_t{1} << (id & 63);
  }
  /// Nothing happens when it is not in the set.
  void Remove(int64_t id) {
    const auto word = static_cast<size_t>(id) >> 6;
    if (word < words_.size()) words_[word] &= ~(uint64_t{1} << (id & 63));
  }
  /// Says of the 64 numbers from 64 * `word` on whether they are in the set, the first by the lowest bit.
  void PutWord(size_t word, uint64_t bits) {
    if (word >= words_.size()) words_.resize(word + word / 2 + 16);
    words_[word] = bits;
  }
  bool Contains(int64_t id) const {
    const auto word = static_cast<size_t>(id) >> 6;
    return word < words_.size() && (words_[word] >> (id & 63) & 1) != 0;
  }
  // The three operations of a query: AND, OR, NOT.
  void IntersectWith(const DocSet& other) {
    if (words_.size() > other.words_.size()) words_.resize(other.words_.size());
    for (size_t i = 0; i < words_.size(); ++i) words_[i] &= other.words_[i];
  }
  void UniteWith(const DocSet& other) {
    if (words_.size() < other.words_.size()) words_.resize(other.words_.size());
    for (size_t i = 0; i < other.words_.size(); ++i) words_[i] |= other.words_[i];
  }
  void Subtract(const DocSet& other) {
    const size_t common = words_.size() < other.words_.size() ? words_.size() : other.words_.size();
    for (size_t i = 0; i < common; ++i) words_[i] &= ~other.words_[i];
  }
  /// Removes the numbers for which `condition` is true.
  template <typename Condition>
  void RemoveIf(Condition&& condition) {
    for (size_t i = 0; i < words_.size(); ++i) {
      for (uint64_t left = words_[i]; left != 0; left &= left - 1) {
        if (condition(static_cast<int64_t>(i * 64) + __builtin_ctzll(left))) words_[i] &= ~(left & -left);
      }
    }
  }
  /// Counts the bits: not to be called in a loop.
  int64_t Count() const {
    int64_t count = 0;
    for (const uint64_t word : words_) count += __builtin_popcountll(word);
    return count;
  }
  /// The memory that the set takes.
  size_t SizeBytes() const { return words_.capacity() * sizeof(uint64_t); }

  /// Calls `visit` for each number in ascending order until it returns false.
  template <typename Visitor>
  void ForEach(Visitor&& visit) const {
    for (size_t i = 0; i < words_.size(); ++i) {
      for (uint64_t word = words_[i]; word != 0; word &= word - 1) {
        if (!visit(static_cast<int64_t>(i * 64) + __builtin_ctzll(word))) return;
      }
    }
  }

 private:
  std::vector<uint64_t> words_;  ///< number n is bit n % 64 of word n / 64; what is beyond the end is not in the set
};

}  // namespace ferrox::engine
