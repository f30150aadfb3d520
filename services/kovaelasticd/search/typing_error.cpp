#include "services/kovaelasticd/search/typing_error.h"

#include <algorithm>
#include <array>
#include <cstdlib>
#include <vector>

#include "services/kovaelasticd/text/fold.h"

namespace ferrox::engine {

namespace {

// What is added for kinds of errors that are less likely than a swap, below half of kTypingError, so that two such
// errors stay two.
constexpr int kOfDouble = 20;     // a letter once or twice
constexpr int kOfNeighbour = 50;  // keys beside each other
constexpr int kOfLetter = 70;     // a letter left out or added
constexpr int kOfOther = 100;     // another letter
constexpr int kNever = 1 << 20;

/// Whether the keys of two letters lie beside each other, on keyboards of Latin letters.
bool AreNeighbours(char32_t a, char32_t b) {
  constexpr std::array<std::string_view, 3> kRows = {"qwertyuiop", "asdfghjkl", "zxcvbnm"};
  const auto place = [&](char32_t letter, int& row, int& column) {
    for (row = 0; row < 3; ++row) {
      const size_t at =
          letter < 0x80 ? kRows[static_cast<size_t>(row)].find(static_cast<char>(letter)) : std::string_view::npos;
      if (at == std::string_view::npos) continue;
      column = static_cast<int>(at);
      return true;
    }
    return false;
  };
  int row_a = 0, column_a = 0, row_b = 0, column_b = 0;
  if (!place(a, row_a, column_a) || !place(b, row_b, column_b)) return false;
  return std::abs(row_a - row_b) <= 1 && std::abs(column_a - column_b) <= 1;
}

/// The letter at `at` of `word` is in no other word, or is once too much.
int CostOfLetter(std::u32string_view word, size_t at) {
  if (at == 0) return 2 * kTypingError + kOfLetter;
  return kTypingError + (word[at] == word[at - 1] ? kOfDouble : kOfLetter);
}

int CostOfChange(std::u32string_view typed, size_t i, std::u32string_view meant, size_t j) {
  if (typed[i] == meant[j]) return 0;
  const int first = i == 0 && j == 0 ? kTypingError : 0;
  return first + kTypingError + (AreNeighbours(typed[i], meant[j]) ? kOfNeighbour : kOfOther);
}

}  // namespace

std::u32string LettersOf(std::string_view word) {
  std::u32string letters;
  for (size_t at = 0; at < word.size();) {
    const CodePoint point = DecodeAt(word, at);
    letters += static_cast<char32_t>(point.value);
    at += point.length_bytes;
  }
  return letters;
}

int TypingCost(std::u32string_view typed, std::u32string_view meant, int errors) {
  const int most = (errors + 1) * kTypingError - 1;
  const size_t band = static_cast<size_t>(errors);
  if (typed.size() + band < meant.size() || meant.size() + band < typed.size()) return kNever;
  // rows[i % 3][j]: of the first i letters typed and j meant; beyond the band nothing is within `errors`.
  std::array<std::vector<int>, 3> rows;
  for (std::vector<int>& row : rows) row.assign(meant.size() + 1, kNever);
  rows[0][0] = 0;
  for (size_t j = 1; j <= std::min(band, meant.size()); ++j) rows[0][j] = rows[0][j - 1] + CostOfLetter(meant, j - 1);
  for (size_t i = 1; i <= typed.size(); ++i) {
    std::vector<int>& row = rows[i % 3];
    const std::vector<int>& last = rows[(i + 2) % 3];
    const std::vector<int>& before = rows[(i + 1) % 3];
    std::fill(row.begin(), row.end(), kNever);
    if (i <= band) row[0] = last[0] + CostOfLetter(typed, i - 1);
    int least = row[0];
    for (size_t j = i > band ? i - band : 1; j <= std::min(meant.size(), i + band); ++j) {
      if (j == 0) continue;
      int cost = std::min({last[j] + CostOfLetter(typed, i - 1), row[j - 1] + CostOfLetter(meant, j - 1),
                           last[j - 1] + CostOfChange(typed, i - 1, meant, j - 1)});
      const bool swapped = i > 1 && j > 1 && typed[i - 1] == meant[j - 2] && typed[i - 2] == meant[j - 1];
      if (swapped && typed[i - 1] != typed[i - 2]) cost = std::min(cost, before[j - 2] + kTypingError);
      row[j] = cost;
      least = std::min(least, cost);
    }
    // The next letter may be swapped with this one, and so go on from the row before.
    if (least > most && *std::min_element(last.begin(), last.end()) > most - kTypingError) return kNever;
  }
  return rows[typed.size() % 3][meant.size()];
}

}  // namespace ferrox::engine
