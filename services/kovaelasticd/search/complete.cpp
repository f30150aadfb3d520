#include "services/kovaelasticd/search/complete.h"

#include <algorithm>
#include <memory>
#include <string_view>
#include <tuple>

#include "services/kovaelasticd/search/typing_error.h"
#include "services/kovaelasticd/search/visible_count.h"
#include "services/kovaelasticd/store/store_rows.h"
#include "services/kovaelasticd/store/word_list.h"

namespace ferrox::engine {

namespace {

constexpr size_t kLeastBegin = 2;
constexpr size_t kLeastBeginOfText = 3;
constexpr size_t kLeastOffered = 4;  ///< letters: groups of characters have three
/// What is done for one completion at most: places of words in names and titles, some 0.3 us each, and looks for the
/// next one; words of texts that are counted, and documents that these have (CountVisible).
constexpr size_t kPlacesMax = 20000;
constexpr size_t kSkipsMax = 100;
constexpr size_t kTextWordsMax = 60;
constexpr size_t kHitsMax = 40000;
/// What joins the name of a field to its word.
constexpr char kFieldEnd = '\x1F';

/// Where to go on behind terms of the table of names that are no words of them; "" for a word.
std::string BehindOthers(std::string_view term) {
  const size_t end = term.find(kFieldEnd);
  if (end != std::string_view::npos) return std::string(term.substr(0, end)) + static_cast<char>(kFieldEnd + 1);
  return LettersOf(term).size() < kLeastOffered ? std::string(term) + '\x01' : "";
}

/// Words of names and titles, in the order of the words. False where it is too much.
bool CompleteFromNames(StoreReader& reader, const Visible& visible, const std::string& begin,
                       std::vector<Completion>& found) {
  const std::string end = EndOfPrefix(begin);
  size_t places = 0, skips = 0;
  int64_t last_document = 0;
  Statement terms = reader.database.Prepare(
      "SELECT term, doc, col FROM temp.meta_terms WHERE term >= ?1 AND term < ?2 AND term <> ?3");
  for (std::string from = begin; !from.empty();) {
    const std::string at = std::move(from);  // the statement refers to it
    from.clear();
    BindEnd(terms.Bind(1, std::string_view(at)).Bind(3, std::string_view(begin)), 2, end);
    while (from.empty() && terms.Step()) {
      const std::string_view term = terms.Text(0);
      const bool is_known = !found.empty() && found.back().word == term;
      if (!is_known) from = BehindOthers(term);
      if (++places > kPlacesMax || (!from.empty() && ++skips > kSkipsMax)) return false;
      const std::string_view column = terms.Text(2);
      const int64_t document = terms.Int(1);
      if (!from.empty() || (column != "name" && column != "title") || !visible.Contains(document)) continue;
      if (is_known && document == last_document) continue;
      if (!is_known) found.push_back({std::string(term), 0, true});
      ++found.back().documents;
      last_document = document;
    }
    terms.Reset();
  }
  return true;
}

/// Words of texts that are not among those of names. False where it is too much.
bool CompleteFromTexts(StoreReader& reader, const Visible& visible, const std::string& begin,
                       std::vector<Completion>& found) {
  const std::shared_ptr<const WordList> words = reader.words.Load(reader.database, visible.Version());
  if (words == nullptr) return false;
  std::vector<std::string> likely;
  words->ForEachBeginning(begin, [&](std::string_view word, bool in_several) {
    if (in_several && word != begin && likely.size() <= kTextWordsMax) likely.emplace_back(word);
  });
  if (likely.size() > kTextWordsMax) return false;
  const size_t of_names = found.size();
  const auto of_name = [&](const std::string& word) {
    const auto last = found.begin() + static_cast<ptrdiff_t>(of_names);
    return std::find_if(found.begin(), last, [&](const Completion& known) { return known.word == word; }) != last;
  };
  size_t hits = 0;
  for (const std::string& word : likely) {
    if (of_name(word)) continue;
    const int64_t documents = CountVisible(reader.database, visible, word, hits);
    if (hits > kHitsMax) return false;
    if (documents > 1) found.push_back({word, documents, false});
  }
  return true;
}

}  // namespace

bool IsBetter(const Completion& a, const Completion& b) {
  const bool a_named = a.in_name && a.documents > 1;
  const bool b_named = b.in_name && b.documents > 1;
  return std::tie(b_named, b.documents, a.word) < std::tie(a_named, a.documents, b.word);
}

std::vector<Completion> CompleteWord(StoreReader& reader, const Visible& visible, const std::string& begin,
                                     size_t limit) {
  std::vector<Completion> found;
  const size_t letters = LettersOf(begin).size();
  if (letters < kLeastBegin || !CompleteFromNames(reader, visible, begin, found)) found.clear();
  if (letters >= kLeastBeginOfText) {
    std::vector<Completion> with_texts = found;
    if (CompleteFromTexts(reader, visible, begin, with_texts)) found = std::move(with_texts);
  }
  std::sort(found.begin(), found.end(), &IsBetter);
  if (found.size() > limit) found.resize(limit);
  return found;
}

}  // namespace ferrox::engine
