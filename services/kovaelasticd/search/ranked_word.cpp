#include "services/kovaelasticd/search/ranked_word.h"

#include <algorithm>
#include <cmath>

namespace ferrox::engine {

double Rarity(int64_t all, int64_t documents) {
  return std::log(1.0 + static_cast<double>(all) / static_cast<double>(1 + documents));
}

size_t CountLetters(std::string_view text) {
  const auto is_letter = [](char c) { return (c >= 'a' && c <= 'z') || (c >= 'A' && c <= 'Z') || (c & 0x80) != 0; };
  return static_cast<size_t>(std::count_if(text.begin(), text.end(), is_letter));
}

}  // namespace ferrox::engine
