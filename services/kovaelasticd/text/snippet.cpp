#include "services/kovaelasticd/text/snippet.h"

#include <algorithm>

#include "services/kovaelasticd/text/clean.h"
#include "services/kovaelasticd/text/words.h"

namespace ferrox::engine {

namespace {

// A snippet is the window of the text with the most different words of the query in it, then the most words. The text
// is cut into words as the index was, so what matched there is found here; reading stops once a window has all words.

// How much of a text is read, and how much behind the first word found.
constexpr size_t kReadMaxBytes = 256 << 10;
constexpr size_t kReadBehindBytes = 64 << 10;
constexpr size_t kMatchesMax = 256;
constexpr size_t kWindowBytes = 180;   ///< from the first to the last word that count together
constexpr size_t kLeadBytes = 60;      ///< shown before the first word
constexpr size_t kSnippetBytes = 240;  ///< in all, without the marks
constexpr char kEllipsis[] = "\xE2\x80\xA6";

/// A word of the query in the text, by bytes.
struct Match {
  size_t begin;
  size_t end;
  size_t word;
};

/// The place of a folded word among those wanted; their number when it is none of them.
size_t FindWord(const std::vector<SnippetWord>& words, std::string_view found) {
  for (size_t i = 0; i < words.size(); ++i) {
    const std::string& word = words[i].word;
    if (found == word || (words[i].prefix && found.substr(0, word.size()) == word)) return i;
  }
  return words.size();
}

/// How many different words stand in the matches `first` .. `last`.
size_t CountDistinct(const std::vector<Match>& matches, size_t first, size_t last, size_t words) {
  std::vector<bool> seen(words);
  for (size_t i = first; i <= last; ++i) seen[matches[i].word] = true;
  return static_cast<size_t>(std::count(seen.begin(), seen.end(), true));
}

/// Finds the words; stops where a snippet ends that shows all of them.
std::vector<Match> FindMatches(std::string_view text, const std::vector<SnippetWord>& words) {
  std::vector<Match> matches;
  WordScanner scanner(text.substr(0, kReadMaxBytes));
  size_t window_first = 0;
  size_t read_end = text.size();
  while (scanner.Next() && scanner.Begin() < read_end) {
    const size_t word = FindWord(words, scanner.Word());
    if (word == words.size()) continue;
    if (matches.empty()) read_end = scanner.Begin() + kReadBehindBytes;
    matches.push_back({scanner.Begin(), scanner.End(), word});
    while (scanner.End() - matches[window_first].begin > kWindowBytes && window_first + 1 < matches.size()) {
      ++window_first;
    }
    const bool all = CountDistinct(matches, window_first, matches.size() - 1, words.size()) == words.size();
    if (all) read_end = std::min(read_end, matches[window_first].begin + kSnippetBytes);
    if (matches.size() >= kMatchesMax) break;
  }
  return matches;
}

/// The first and last match of the window with the most different words, then the most words.
std::pair<size_t, size_t> BestWindow(const std::vector<Match>& matches, size_t words) {
  std::pair<size_t, size_t> best{0, 0};
  std::pair<size_t, size_t> best_value{0, 0};
  size_t first = 0;
  for (size_t last = 0; last < matches.size(); ++last) {
    while (matches[last].end - matches[first].begin > kWindowBytes && first < last) ++first;
    const std::pair<size_t, size_t> value{CountDistinct(matches, first, last, words), last - first};
    if (value <= best_value) continue;
    best_value = value;
    best = {first, last};
  }
  return best;
}

bool IsContinuationByte(char c) { return (static_cast<unsigned char>(c) & 0xC0) == 0x80; }

/// Moves `pos` on to the beginning of a word, at most a few bytes.
size_t WordStart(std::string_view text, size_t pos, size_t limit) {
  const size_t blank = text.find_first_of(" \n\t", pos);
  if (blank != std::string_view::npos && blank + 1 <= limit && blank < pos + kLeadBytes / 2) return blank + 1;
  while (pos < limit && IsContinuationByte(text[pos])) ++pos;
  return pos;
}

}  // namespace

std::string MakeSnippet(std::string_view text, const std::vector<SnippetWord>& words, const std::string& mark_start,
                        const std::string& mark_end) {
  const std::vector<Match> matches = FindMatches(text, words);
  if (matches.empty()) return {};
  const auto [first, last] = BestWindow(matches, words.size());
  const size_t lead = std::min(matches[first].begin, kLeadBytes);
  const size_t begin = lead < kLeadBytes ? 0 : WordStart(text, matches[first].begin - lead, matches[first].begin);
  size_t end = std::min(text.size(), std::max(begin + kSnippetBytes, matches[last].end));
  while (end < text.size() && IsContinuationByte(text[end])) ++end;

  std::string snippet = begin > 0 ? kEllipsis : "";
  size_t done = begin;
  for (size_t i = first; i < matches.size() && matches[i].end <= end; ++i) {
    if (matches[i].begin < done) continue;
    const size_t match_begin = matches[i].begin;
    size_t match_end = matches[i].end;
    // Pairs of characters overlap: they are marked as one.
    while (i + 1 < matches.size() && matches[i + 1].begin < match_end && matches[i + 1].end <= end) {
      match_end = std::max(match_end, matches[++i].end);
    }
    AppendClean(snippet, text.substr(done, match_begin - done));
    snippet += mark_start;
    AppendClean(snippet, text.substr(match_begin, match_end - match_begin));
    snippet += mark_end;
    done = match_end;
  }
  AppendClean(snippet, text.substr(done, end - done));
  if (end < text.size()) snippet += kEllipsis;
  return snippet;
}

}  // namespace ferrox::engine
