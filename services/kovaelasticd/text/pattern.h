#pragma once

#include <cstddef>
#include <string>
#include <string_view>
#include <vector>

namespace ferrox::engine {

/// Whether a word of a query has "*" or "?" as wildcards, and not as punctuation ("what?!", "**bold**") or part of
/// something else (a URL). A "*" at its end alone makes none: that asks for the beginning of a word. A pattern has two
/// letters at least, or four digits.
bool IsPattern(std::string_view word);

/// "*" stands for any characters, "?" for one. Matching is linear in the name for each "*", at worst.
class Pattern {
 public:
  static constexpr size_t kMostBytes = 255;

  explicit Pattern(std::string_view pattern);

  /// Whether a folded name has it as a whole or in part. A part must begin and end where a word does, unless the
  /// pattern begins or ends with "*".
  bool MatchesName(std::string_view folded_name) const;
  /// Whether a folded word is like this from its first letter to its last.
  bool MatchesWord(std::string_view folded_word) const;
  /// Whether words of letters can be like this at all.
  bool IsOfLetters() const;
  /// What words that match begin with.
  std::string_view Beginning() const;
  /// The parts of three characters and more without wildcards, which all names that match have.
  std::vector<std::string> Parts() const;
  const std::string& Folded() const { return folded_; }

 private:
  bool Matches(std::string_view text, bool whole) const;

  std::string folded_;
};

}  // namespace ferrox::engine
