#pragma once

#include <cstddef>
#include <string_view>
#include <vector>

namespace base {

/// How far words are from one word: the number of bytes to insert, remove, change or swap with the next one
/// (Damerau-Levenshtein, computed row by row). Words are folded, so a byte is a letter in Latin script. The other word
/// is appended byte by byte, so that those that begin alike are compared together.
class EditDistance {
 public:
  /// `word` must outlive this. Only distances up to `limit` count.
  EditDistance(std::string_view word, size_t limit);

  /// @return whether any word that begins with what was appended may be within the limit.
  bool Append(char c);
  /// Drops all but the first `length` bytes of what was appended.
  void Cut(size_t length);
  /// Of what was appended; limit + 1 when it is more.
  size_t Distance() const;
  size_t DistanceOf(std::string_view other);

 private:
  struct Row {
    char last;
    size_t least;
    std::vector<size_t> distances;  ///< of the first so many bytes of the word
  };

  const std::string_view word_;
  const size_t limit_;
  std::vector<Row> rows_;  ///< one more than bytes were appended
};

}  // namespace base
