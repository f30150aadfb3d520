#pragma once

#include <string>
#include <string_view>
#include <vector>

namespace ferrox::engine {

/// How else a folded word of a query may stand in documents, at most three words: "mueller" for "muller" and the other
/// way round ("ü" is folded to "u"), "arhus" for "aarhus", an Arabic or Hebrew word with its article or without it.
/// They are guesses: worth less than the word itself.
std::vector<std::string> OtherSpellings(std::string_view folded_word);

}  // namespace ferrox::engine
