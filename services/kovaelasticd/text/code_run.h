#pragma once

#include <cstddef>
#include <string>
#include <string_view>

namespace ferrox::engine {

/// Groups of letters and digits that are one code together.
struct CodeRun {
  std::string joined;  ///< the letters and digits, folded; "" when they are too few, too many, or no code
  size_t end = 0;      ///< behind the last group, also when there is no code
  size_t parts = 0;    ///< how many groups, or of a wide run how many parts between blanks
};

/// Reads the groups from `pos` on, where one begins, between each of which is one of "-./_,:": each has a digit, but
/// the first may be up to four letters. `any_case`: that first group before a blank may be of small letters.
CodeRun ReadTightRun(std::string_view text, size_t pos);

/// Reads tight runs from `pos` on between which is a blank: "DE89 3704 0044", "(089) 1234-56", "ISO 9001".
/// `any_case`: small letters alone can be the beginning of one, too.
CodeRun ReadWideRun(std::string_view text, size_t pos, bool any_case);

}  // namespace ferrox::engine
