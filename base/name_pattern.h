#pragma once

#include <bitset>
#include <cstddef>
#include <cstdint>
#include <string>
#include <string_view>
#include <vector>

namespace base {

/// A pattern for one name: bytes, "?" (one byte), "*" (any number of them), "[...]" (one byte of a set) and "\" (the
/// next byte as it is). Matches case by case and byte by byte; a name's leading dot is a byte like others. Matching
/// never tries more than the pattern's length times the name's.
class NamePattern {
 public:
  /// Reads a pattern up to its end or to a "/" that stands in no set, from `at` on, which is moved there. @return false
  /// for one that can match nothing: an open set, or a backslash at the end.
  bool Read(std::string_view text, size_t& at);

  bool Matches(std::string_view name) const;
  /// With which bytes a name begins that it matches, and maybe with others.
  std::bitset<256> Begins() const;
  bool Empty() const { return tokens_.empty(); }
  /// Whether it is a name without wildcards; Literal says which.
  bool IsPlain() const { return stars_ == 0 && sets_.empty() && ones_ == 0; }
  /// Whether it is "*" and then bytes alone, of which the first is the only dot; Literal gives these.
  bool IsExtension() const;
  /// Its bytes, without the wildcards.
  std::string Literal() const;

 private:
  enum class Kind : uint8_t { kByte, kOne, kMany, kSet };
  struct Token {
    Kind kind;
    uint16_t value;  ///< the byte, or the set's number
  };
  using Set = std::bitset<256>;

  bool ReadSet(std::string_view text, size_t& at);
  bool Fits(const Token& token, char byte) const;

  std::vector<Token> tokens_;
  std::vector<Set> sets_;
  size_t stars_ = 0;
  size_t ones_ = 0;
};

}  // namespace base
