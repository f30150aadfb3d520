#include "services/kovaelasticd/search/ranked_word.h"

#include <algorithm>
#include <cmath>

namespace ferrox::engine {

double Rarity(int64_t all, int64_t documents) {
  const auto with = static_cast<double>(documents);
  const auto without = static_cast<double>(std::max<int64_t>(0, all - documents));
  return std::log(1 + (without + 0.5) / (with + 0.5));
}

size_t CountLetters(std::string_view text) {
  const auto is_letter = [](char c) { return (c >= 'a' && c <= 'z') || (c >= 'A' && c <= 'Z') || (c & 0x80) != 0; };
  return static_cast<size_t>(std::count_if(text.begin(), text.end(), is_letter));
}

}  // namespace ferrox::engine
