#pragma once

#include <array>
#include <cstdint>
#include <string>
#include <string_view>
#include <vector>

#include "services/kovaelasticd/text/fold.h"

namespace ferrox::engine {

/// A longer word is indexed, and looked for, by its first 64 bytes at most, never within a character.
constexpr size_t kWordMaxBytes = 64;

/// Cuts a text into index words, one after the other: runs of letters and digits, folded; text of scripts without
/// blanks as overlapping pairs of characters and the last character of the run. Each word has its own position, so
/// that "a_b" is a followed by b.
class WordScanner {
 public:
  /// kWord: of letters and digits. kPair: two neighbouring characters of a script without blanks. kRunEnd: the last
  /// character of a run of these.
  enum class Kind : uint8_t { kWord, kPair, kRunEnd };

  /// `text` must outlive the scanner.
  explicit WordScanner(std::string_view text) : text_(text) {}

  /// Goes to the next word; false at the end.
  bool Next();
  /// The present word, folded; valid until the next call of Next.
  std::string_view Word() const { return {word_.data(), word_size_}; }
  Kind WordKind() const { return kind_; }
  /// Where it stands in the text, in bytes.
  size_t Begin() const { return begin_; }
  size_t End() const { return end_; }

 private:
  bool Emit(Kind kind, size_t begin, size_t end);
  bool NextPair(const CodePoint& c);
  bool NextPlainWord();
  void Append(std::string_view folded);

  std::string_view text_;
  size_t pos_ = 0;  ///< what is to be read next
  // The present word and its place.
  std::array<char, kWordMaxBytes> word_;
  size_t word_size_ = 0;
  std::string piece_;     ///< the folded character at hand
  std::string previous_;  ///< the folded character that waits for its second half
  size_t previous_begin_ = 0;
  size_t previous_end_ = 0;
  size_t begin_ = 0;
  size_t end_ = 0;
  Kind kind_ = Kind::kWord;
};

/// The words of a text that is looked for as one phrase, such as "a_b" or a word of a script without blanks.
struct QueryWords {
  std::vector<std::string> words;
  /// The last word is only the beginning of one.
  bool prefix = false;
};
/// Cuts the text of a condition as documents are cut. `prefix`: a "*" stood behind it.
QueryWords SplitQueryText(std::string_view text, bool prefix);

/// The overlapping groups of three characters of the folded text: what finds a part of a file name. At most `limit`.
std::vector<std::string> Trigrams(std::string_view text, size_t limit);

}  // namespace ferrox::engine
