#include "services/kovaelasticd/store/suggest.h"

#include <algorithm>
#include <map>
#include <string_view>
#include <tuple>
#include <utility>

#include "base/edit_distance.h"
#include "services/kovaelasticd/store/fts.h"
#include "services/kovaelasticd/store/store_rows.h"

namespace ferrox::engine {

namespace {

constexpr size_t kSuggestedMax = 3;
constexpr size_t kShortestWord = 3;

struct Known {
  size_t distance;
  int64_t documents;
  std::string word;
};

/// A word of up to five bytes may differ in one letter, a longer one in two.
size_t LimitFor(const std::string& word) { return word.size() < 6 ? 1 : 2; }

/// The nearest first, then those in the most documents.
std::vector<std::string> BestOf(std::vector<Known> candidates) {
  const size_t count = std::min(candidates.size(), kSuggestedMax);
  std::partial_sort(candidates.begin(), candidates.begin() + static_cast<ptrdiff_t>(count), candidates.end(),
                    [](const Known& a, const Known& b) {
                      return std::tie(a.distance, b.documents, a.word) < std::tie(b.distance, a.documents, b.word);
                    });
  std::vector<std::string> words;
  for (size_t i = 0; i < count; ++i) words.push_back(std::move(candidates[i].word));
  return words;
}

/// Known words like `word`, with the same first letter.
std::vector<std::string> SuggestWord(Database& database, const std::string& word) {
  if (word.size() < kShortestWord) return {};
  const size_t limit = LimitFor(word);
  base::EditDistance distances(word, limit);
  std::vector<Known> candidates;
  Statement statement = database.Prepare("SELECT word, documents FROM suggestions WHERE word >= ?1 AND word < ?2");
  const std::string begin = word.substr(0, 1);  // the statement refers to these texts
  const std::string end = EndOfPrefix(begin);
  BindEnd(statement.Bind(1, std::string_view(begin)), 2, end);
  while (statement.Step()) {
    const size_t distance = distances.DistanceOf(statement.Text(0));
    if (distance == 0 || distance > limit) continue;
    candidates.push_back({distance, statement.Int(1), std::string(statement.Text(0))});
  }
  return BestOf(std::move(candidates));
}

/// The words of the full-text tables, as far as a search's share of work goes.
class Vocabulary {
 public:
  Vocabulary(Database& database, const Visible& visible) : database_(database), visible_(visible) {}

  /// Whether there was more to do than is done for one search.
  bool IsExhausted() const { return looks_ > kLooksMax || hits_ > kHitsMax; }

  /// The words with the first byte of `word`, within `limit` of it, that two visible documents or more have. Goes
  /// through the words in their order, and passes over all that begin as no word within the limit does.
  std::vector<Known> Near(const std::string& word, size_t limit) {
    std::map<std::string, Known> near;  // of both tables
    for (const char* next : {"SELECT term FROM temp.content_terms WHERE term >= ?1 LIMIT 1",
                             "SELECT term FROM temp.meta_terms WHERE term >= ?1 LIMIT 1"}) {
      base::EditDistance distances(word, limit);
      for (std::string from(1, word.front()); !from.empty() && !IsExhausted();) {
        const std::string found = FirstFrom(next, from);
        if (found.empty() || found.front() != word.front()) break;
        const size_t length = Follow(distances, found);
        if (length < found.size()) {
          from = NextBeginning(distances, found.substr(0, length + 1));
          continue;
        }
        from = found + '\x01';  // no word has a byte below that
        const size_t distance = distances.Distance();
        if (distance > 0 && distance <= limit && IsOffered(found)) near.try_emplace(found, Known{distance, 0, found});
      }
    }
    std::vector<Known> known;
    for (auto& [text, entry] : near) {
      entry.documents = CountVisible(text);
      if (entry.documents > 1) known.push_back(std::move(entry));
    }
    return known;
  }

 private:
  /// A look costs some 20 us, a hit 0.1.
  static constexpr size_t kLooksMax = 10000;
  static constexpr size_t kHitsMax = 1000000;

  /// As RebuildSuggestions chooses.
  static bool IsOffered(const std::string& word) {
    return word.size() >= 4 && word.size() <= 24 && (word.front() < '0' || word.front() > '9');
  }

  std::string FirstFrom(const char* sql, const std::string& from) {
    ++looks_;
    Statement statement = database_.Prepare(sql);
    return statement.Bind(1, std::string_view(from)).Step() ? std::string(statement.Text(0)) : "";
  }

  /// How many bytes of `word` words within the limit may begin with; these are appended.
  static size_t Follow(base::EditDistance& distances, const std::string& word) {
    distances.Cut(0);
    for (size_t i = 0; i < word.size(); ++i) {
      if (!distances.Append(word[i])) return i;
    }
    return word.size();
  }

  /// The first beginning behind all words that begin with `begin`, of which words within the limit may be; "" for none
  /// with the same first byte.
  static std::string NextBeginning(base::EditDistance& distances, std::string begin) {
    for (; begin.size() > 1; begin.pop_back()) {
      for (int byte = static_cast<unsigned char>(begin.back()) + 1; byte <= 0xFF; ++byte) {
        distances.Cut(begin.size() - 1);
        begin.back() = static_cast<char>(byte);
        if (distances.Append(begin.back())) return begin;
      }
    }
    return "";
  }

  int64_t CountVisible(const std::string& word) {
    if (IsExhausted()) return 0;
    HitCollector found(0, visible_);
    const std::string phrase = PhraseExpression({word}, false);
    Collect(database_, "content_fts", phrase, false, found);
    Collect(database_, "meta_fts", "{name title} : " + phrase, false, found);
    hits_ += found.Seen();
    return found.Set().Count();
  }

  Database& database_;
  const Visible& visible_;
  size_t looks_ = 0;
  size_t hits_ = 0;
};

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

std::vector<std::string> SuggestVisible(Database& database, const std::vector<std::string>& words,
                                        const Visible& visible) {
  Vocabulary vocabulary(database, visible);
  std::vector<std::string> suggestions;
  for (const std::string& word : words) {
    if (word.size() < kShortestWord || suggestions.size() == kSuggestedMax) continue;
    std::vector<Known> near = vocabulary.Near(word, LimitFor(word));
    if (vocabulary.IsExhausted()) return {};
    for (std::string& similar : BestOf(std::move(near))) {
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
  // Words in the most documents, from names and titles too; a single occurrence is as likely an error itself. Digits
  // and kStemMark, which stems begin with, are before ':'.
  database.Execute(
      "INSERT OR IGNORE INTO suggestions SELECT term, doc FROM temp.content_words"
      " WHERE doc > 1 AND length(term) BETWEEN 4 AND 24 AND term >= ':' ORDER BY doc DESC LIMIT 50000");
  database.Execute(
      "INSERT OR IGNORE INTO suggestions SELECT term, doc FROM temp.meta_words WHERE col IN ('name', 'title')"
      " AND length(term) BETWEEN 4 AND 24 AND term >= ':' ORDER BY doc DESC LIMIT 10000");
}

}  // namespace ferrox::engine
