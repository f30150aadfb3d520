#pragma once

#include <array>
#include <cstddef>
#include <cstdint>
#include <string>
#include <string_view>
#include <vector>

namespace ferrox::engine {

/// Finds the further words under which a text has its identifiers, numbers and codes, beside the plain ones. At the
/// place of "camelCase" these are "camel" and "case", of "AB1234" "ab" and "1234"; at the first word of "AB-1234/5",
/// "2022-07-05", "34.567,89" or "DE89 3704 0044 0532 0130 00" all of its letters and digits as one word; at "fBbold",
/// behind the backslash of a manual page's source, "bold".
class CodeScanner {
 public:
  /// `text` must outlive the scanner.
  explicit CodeScanner(std::string_view text) : text_(text) {}

  /// The further words at the place of the word at `begin` .. `end` of the text; valid until the next call. To be
  /// called with the words that WordScanner finds, in their order.
  const std::vector<std::string>& At(size_t begin, size_t end);

 private:
  void Add(std::string word);
  void AddParts(size_t begin, size_t end);
  void AddJoined(size_t begin);

  std::string_view text_;
  std::vector<std::string> words_;
  /// The hashes of words that were added, by their lowest bits: such a word need not be in the index again.
  std::array<uint64_t, 512> added_{};
  size_t tight_end_ = 0;  ///< the code that was joined last, without blanks, ends here
  size_t wide_end_ = 0;   ///< the same, with blanks
};

/// The single words under which documents have numbers, dates and codes such as "AB-1234/5", however the text of a
/// condition separates or groups them; none where it is no such thing as a whole, or is one word already.
std::vector<std::string> JoinedCodes(std::string_view text);

}  // namespace ferrox::engine
