#pragma once

#include <string>
#include <string_view>

namespace ferrox::engine {

/// The letters of a folded word.
std::u32string LettersOf(std::string_view word);

/// What separates a word from the one that was meant, as a cost: kTypingError for each letter that was left out, added,
/// taken for another, or swapped with the next one, and a part of that for kinds of errors that are less likely. A
/// wrong first letter counts as two errors.
inline constexpr int kTypingError = 1000;
/// @return a cost of `errors` errors and a part at most; a higher one where there are more.
int TypingCost(std::u32string_view typed, std::u32string_view meant, int errors);

}  // namespace ferrox::engine
