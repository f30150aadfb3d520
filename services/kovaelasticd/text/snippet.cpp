#include "services/kovaelasticd/text/snippet.h"

#include <algorithm>
#include <utility>

#include "services/kovaelasticd/text/clean.h"
#include "services/kovaelasticd/text/words.h"

namespace ferrox::engine {

namespace {

// A passage is the window of the text with the most different words of the query in it, by weight, then the one where
// they stand closest. The text is cut into words as the index was, so what matched there is found here; reading stops
// once a window has all words.

// How much of a text is read, and how much behind the first word found.
constexpr size_t kReadMaxBytes = 256 << 10;
constexpr size_t kReadBehindBytes = 64 << 10;
constexpr size_t kMatchesMax = 256;
constexpr size_t kWindowBytes = 180;   ///< from the first to the last word that count together
constexpr size_t kSnippetBytes = 240;  ///< in all, without the marks
constexpr size_t kLeadBytes = 60;      ///< shown before the first word
/// What being close together, and being many, can add to a window that shows words of weight 1.
constexpr double kClosenessMax = 0.5;
constexpr double kManyMax = 0.25;
constexpr double kTitleShare = 0.5;  ///< what a window within the title is worth
/// A title stands in the beginning; a manual page's description behind this.
constexpr size_t kTitleMaxPlace = 16 << 10;
constexpr std::string_view kTitleDash = " - ";
/// Words that do not begin alike have not the same stem.
constexpr size_t kStemHeadBytes = 3;
constexpr char kEllipsis[] = "\xE2\x80\xA6";

/// A word of the query in the text, by bytes.
struct Match {
  size_t begin;
  size_t end;
  size_t word;
};

/// Tells which words of a text are those wanted.
class WantedWords {
 public:
  WantedWords(const std::vector<SnippetWord>& words, Language language) : words_(words), language_(language) {
    for (const SnippetWord& word : words) {
      stems_.emplace_back(language == Language::kNone || word.prefix ? "" : stemmer_.MarkedStem(language, word.word));
    }
  }

  /// The place of a folded word among those wanted; their number when it is none of them.
  size_t Find(std::string_view found) {
    for (size_t i = 0; i < words_.size(); ++i) {
      const std::string& word = words_[i].word;
      if (found == word || (words_[i].prefix && found.substr(0, word.size()) == word)) return i;
    }
    for (size_t i = 0; i < words_.size(); ++i) {
      if (stems_[i].empty() || found.substr(0, kStemHeadBytes) != words_[i].word.substr(0, kStemHeadBytes)) continue;
      if (stemmer_.MarkedStem(language_, found) == stems_[i]) return i;
    }
    return words_.size();
  }

 private:
  const std::vector<SnippetWord>& words_;
  const Language language_;
  Stemmer stemmer_;
  std::vector<std::string> stems_;
};

/// Neighbouring matches, by their places among all, and the words that they show.
struct Window {
  size_t first = 0;
  size_t last = 0;
  double value = -1;
  std::vector<bool> shows;
};

std::vector<bool> WordsShown(const std::vector<Match>& matches, size_t first, size_t last, size_t words) {
  std::vector<bool> shown(words);
  for (size_t i = first; i <= last; ++i) shown[matches[i].word] = true;
  return shown;
}

bool AreAll(const std::vector<bool>& shown) { return std::find(shown.begin(), shown.end(), false) == shown.end(); }

/// Finds the words; stops where a snippet ends that shows all of them.
std::vector<Match> FindMatches(std::string_view text, const std::vector<SnippetWord>& words, Language language,
                               size_t title_end) {
  std::vector<Match> matches;
  WantedWords wanted(words, language);
  WordScanner scanner(text.substr(0, kReadMaxBytes));
  size_t window_first = 0;
  size_t read_end = text.size();
  while (scanner.Next() && scanner.Begin() < read_end) {
    const size_t word = wanted.Find(scanner.Word());
    if (word == words.size()) continue;
    if (matches.empty()) read_end = scanner.Begin() + kReadBehindBytes;
    matches.push_back({scanner.Begin(), scanner.End(), word});
    while (scanner.End() - matches[window_first].begin > kWindowBytes && window_first + 1 < matches.size()) {
      ++window_first;
    }
    const bool all = AreAll(WordsShown(matches, window_first, matches.size() - 1, words.size()));
    if (all && scanner.End() > title_end) read_end = std::min(read_end, matches[window_first].begin + kSnippetBytes);
    if (matches.size() >= kMatchesMax) break;
  }
  return matches;
}

/// The window that shows most of the words that `shown` lacks.
Window BestWindow(const std::vector<Match>& matches, const std::vector<SnippetWord>& words,
                  const std::vector<bool>& shown, size_t title_end) {
  Window best;
  size_t first = 0;
  for (size_t last = 0; last < matches.size(); ++last) {
    while (matches[last].end - matches[first].begin > kWindowBytes && first < last) ++first;
    Window window{first, last, 0, WordsShown(matches, first, last, words.size())};
    double weight = 0;
    for (size_t i = 0; i < words.size(); ++i) weight += window.shows[i] && !shown[i] ? words[i].weight : 0;
    if (weight <= 0) continue;
    const size_t span = std::min(kWindowBytes, matches[last].end - matches[first].begin);
    const double closeness = 1 - static_cast<double>(span) / kWindowBytes;
    const double count = static_cast<double>(std::min<size_t>(last - first, 8)) / 8;
    window.value = weight + kClosenessMax * closeness + kManyMax * count;
    if (matches[last].end <= title_end) window.value *= kTitleShare;
    if (window.value > best.value) best = std::move(window);
  }
  return best;
}

/// Where the text's title ends; 0 when it is not told, or not found as it is shown.
size_t TitleEnd(std::string_view text, std::string_view title) {
  const size_t dash = title.find(kTitleDash);
  if (dash != title.npos) title.remove_prefix(dash + kTitleDash.size());
  if (title.empty()) return 0;
  const size_t place = text.substr(0, kTitleMaxPlace).find(title);
  return place == text.npos ? 0 : place + title.size();
}

bool IsContinuationByte(char c) { return (static_cast<unsigned char>(c) & 0xC0) == 0x80; }

/// Moves `pos` on to the beginning of a word, at most a few bytes.
size_t WordStart(std::string_view text, size_t pos, size_t limit) {
  const size_t blank = text.find_first_of(" \n\t", pos);
  if (blank != std::string_view::npos && blank + 1 <= limit && blank < pos + kLeadBytes / 2) return blank + 1;
  while (pos < limit && IsContinuationByte(text[pos])) ++pos;
  return pos;
}

/// One passage, as bytes of the text.
struct Passage {
  size_t first;  ///< the first match that it shows
  size_t begin;
  size_t end;
};

/// The passage around a window, of about `bytes`.
Passage PassageAround(std::string_view text, const std::vector<Match>& matches, const Window& window, size_t bytes) {
  const Match& first = matches[window.first];
  const size_t lead_max = kLeadBytes * bytes / kSnippetBytes;
  const size_t lead = std::min(first.begin, lead_max);
  const size_t begin = lead < lead_max ? 0 : WordStart(text, first.begin - lead, first.begin);
  size_t end = std::min(text.size(), std::max(begin + bytes, matches[window.last].end));
  while (end < text.size() && IsContinuationByte(text[end])) ++end;
  return {window.first, begin, end};
}

/// Appends the passage with the matches in it marked.
void AppendPassage(std::string& snippet, std::string_view text, const std::vector<Match>& matches,
                   const Passage& passage, const std::string& mark_start, const std::string& mark_end) {
  size_t done = passage.begin;
  for (size_t i = passage.first; i < matches.size() && matches[i].end <= passage.end; ++i) {
    if (matches[i].begin < done) continue;
    const size_t match_begin = matches[i].begin;
    size_t match_end = matches[i].end;
    // Pairs of characters overlap: they are marked as one.
    while (i + 1 < matches.size() && matches[i + 1].begin < match_end && matches[i + 1].end <= passage.end) {
      match_end = std::max(match_end, matches[++i].end);
    }
    AppendClean(snippet, text.substr(done, match_begin - done));
    snippet += mark_start;
    AppendClean(snippet, text.substr(match_begin, match_end - match_begin));
    snippet += mark_end;
    done = match_end;
  }
  AppendClean(snippet, text.substr(done, passage.end - done));
}

/// The passages to show, one or two, in the order of the text.
std::vector<Passage> ChoosePassages(std::string_view text, const std::vector<Match>& matches,
                                    const std::vector<SnippetWord>& words, size_t title_end) {
  const Window best = BestWindow(matches, words, std::vector<bool>(words.size()), title_end);
  if (!AreAll(best.shows)) {
    const Window other = BestWindow(matches, words, best.shows, title_end);
    if (other.value > 0) {
      Passage one = PassageAround(text, matches, best, kSnippetBytes / 2);
      Passage two = PassageAround(text, matches, other, kSnippetBytes / 2);
      if (two.begin < one.begin) std::swap(one, two);
      if (one.end < two.begin) return {one, two};
    }
  }
  return {PassageAround(text, matches, best, kSnippetBytes)};
}

}  // namespace

std::string MakeSnippet(std::string_view text, const std::vector<SnippetWord>& words, const std::string& mark_start,
                        const std::string& mark_end, const SnippetOf& of) {
  const size_t title_end = TitleEnd(text, of.title);
  const std::vector<Match> matches = FindMatches(text, words, of.language, title_end);
  if (matches.empty()) return {};
  std::string snippet;
  size_t end = 0;
  for (const Passage& passage : ChoosePassages(text, matches, words, title_end)) {
    if (passage.begin > 0) snippet += kEllipsis;
    AppendPassage(snippet, text, matches, passage, mark_start, mark_end);
    end = passage.end;
  }
  if (end < text.size()) snippet += kEllipsis;
  return snippet;
}

}  // namespace ferrox::engine
