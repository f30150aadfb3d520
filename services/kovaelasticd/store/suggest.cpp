#include "services/kovaelasticd/store/suggest.h"

#include <algorithm>
#include <string_view>
#include <utility>

#include "services/kovaelasticd/store/store_rows.h"

namespace ferrox::engine {

namespace {

constexpr size_t kSuggestedMax = 3;
constexpr size_t kShortestWord = 3;

/// The number of bytes to insert, remove, change or swap with the next one (Damerau-Levenshtein, computed row by row);
/// `limit` + 1 when there are more. Words are folded, so a byte is a letter in Latin script.
size_t EditDistance(std::string_view a, std::string_view b, size_t limit) {
  if (a.size() > b.size()) std::swap(a, b);
  if (b.size() - a.size() > limit) return limit + 1;
  std::vector<size_t> before_last(a.size() + 1);
  std::vector<size_t> last(a.size() + 1);
  std::vector<size_t> row(a.size() + 1);
  for (size_t i = 0; i <= a.size(); ++i) last[i] = i;
  for (size_t j = 1; j <= b.size(); ++j) {
    row[0] = j;
    for (size_t i = 1; i <= a.size(); ++i) {
      const size_t change = a[i - 1] == b[j - 1] ? 0 : 1;
      row[i] = std::min({last[i] + 1, row[i - 1] + 1, last[i - 1] + change});
      const bool swapped = i > 1 && j > 1 && a[i - 1] == b[j - 2] && a[i - 2] == b[j - 1];
      if (swapped) row[i] = std::min(row[i], before_last[i - 2] + 1);
    }
    before_last.swap(last);
    last.swap(row);
  }
  return std::min(last[a.size()], limit + 1);
}

struct Known {
  size_t distance;
  int64_t documents;
  std::string word;
};

/// Known words like `word`, with the same first letter: the nearest first, then those in the most documents. A word of
/// up to five bytes may differ in one letter, a longer one in two.
std::vector<std::string> SuggestWord(Database& database, const std::string& word) {
  if (word.size() < kShortestWord) return {};
  const size_t limit = word.size() < 6 ? 1 : 2;
  std::vector<Known> candidates;
  Statement statement = database.Prepare("SELECT word, documents FROM suggestions WHERE word >= ?1 AND word < ?2");
  const std::string begin = word.substr(0, 1);  // the statement refers to these texts
  const std::string end = EndOfPrefix(begin);
  BindEnd(statement.Bind(1, std::string_view(begin)), 2, end);
  while (statement.Step()) {
    const size_t distance = EditDistance(word, statement.Text(0), limit);
    if (distance == 0 || distance > limit) continue;
    candidates.push_back({distance, statement.Int(1), std::string(statement.Text(0))});
  }
  const size_t count = std::min(candidates.size(), kSuggestedMax);
  std::partial_sort(candidates.begin(), candidates.begin() + static_cast<ptrdiff_t>(count), candidates.end(),
                    [](const Known& a, const Known& b) {
                      return a.distance != b.distance ? a.distance < b.distance : a.documents > b.documents;
                    });
  std::vector<std::string> words;
  for (size_t i = 0; i < count; ++i) words.push_back(candidates[i].word);
  return words;
}

}  // namespace

std::vector<std::string> Suggest(Database& database, const std::vector<std::string>& words) {
  std::vector<std::string> suggestions;
  for (const std::string& word : words) {
    for (std::string& similar : SuggestWord(database, word)) {
      if (suggestions.size() < kSuggestedMax) suggestions.push_back(std::move(similar));
    }
  }
  return suggestions;
}

void RebuildSuggestions(Database& database) {
  // fts5vocab lists the words of a full-text table: 'row' each once, 'col' once for each column.
  database.Execute(
      "CREATE VIRTUAL TABLE IF NOT EXISTS temp.content_words USING fts5vocab('main', 'content_fts', 'row')");
  database.Execute("CREATE VIRTUAL TABLE IF NOT EXISTS temp.meta_words USING fts5vocab('main', 'meta_fts', 'col')");
  database.Execute("DELETE FROM suggestions");
  // Words in the most documents, from names and titles too; a single occurrence is as likely an error itself.
  database.Execute(
      "INSERT OR IGNORE INTO suggestions SELECT term, doc FROM temp.content_words"
      " WHERE doc > 1 AND length(term) BETWEEN 4 AND 24 AND term NOT GLOB '[0-9]*' ORDER BY doc DESC LIMIT 50000");
  database.Execute(
      "INSERT OR IGNORE INTO suggestions SELECT term, doc FROM temp.meta_words WHERE col IN ('name', 'title')"
      " AND length(term) BETWEEN 4 AND 24 AND term NOT GLOB '[0-9]*' ORDER BY doc DESC LIMIT 10000");
}

}  // namespace ferrox::engine
