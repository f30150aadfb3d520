#include "services/kovaelasticd/store/fts.h"

#include <algorithm>
#include <cstring>
#include <new>
#include <string_view>
#include <utility>

#include "services/kovaelasticd/store/document.h"
#include "services/kovaelasticd/store/fts_positions.h"
#include "services/kovaelasticd/text/codes.h"
#include "services/kovaelasticd/text/stems.h"
#include "services/kovaelasticd/text/words.h"

namespace ferrox::engine {

namespace {

// SQLite's FTS5 keeps the words; cutting text into words and counting hits is done here, by two extensions: the
// tokenizer "kova" and the function kova_collect. A table is given three kinds of text, told apart by their first byte
// (document.h): prose, which WordScanner cuts and Stemmer stems; a name, of which all groups of three characters are
// indexed; and ready words. Queries are made of ready words, each quoted, so that none is taken for an operator.

/// By this name sqlite3_value_pointer makes sure that the function is called by Collect and by no query of others.
constexpr char kCollectorType[] = "HitCollector";
/// A name has at most 255 bytes; a display text that takes its place is cut.
constexpr size_t kNameGramsMax = 512;

/// What FTS5 gives a tokenizer to hand its words to.
using TokenSink = int (*)(void*, int, const char*, int, int, int);

/// Hands words on to the full-text index.
class TokenOutput {
 public:
  TokenOutput(void* context, TokenSink sink) : context_(context), sink_(sink) {}
  /// `flags`: FTS5_TOKEN_COLOCATED for a word at the place of the one before.
  bool Put(std::string_view word, size_t begin, size_t end, int flags = 0) {
    result_ = sink_(context_, flags, word.data(), static_cast<int>(word.size()), static_cast<int>(begin),
                    static_cast<int>(end));
    return result_ == SQLITE_OK;
  }
  int Result() const { return result_; }

 private:
  void* context_;
  TokenSink sink_;
  int result_ = SQLITE_OK;
};

void PutGrams(TokenOutput& output, std::string_view text) {
  for (const std::string& gram : Trigrams(text, kNameGramsMax)) {
    if (!output.Put(gram, 0, 0)) return;
  }
}

void PutReadyWords(TokenOutput& output, std::string_view text) {
  while (!text.empty()) {
    const size_t end = text.find(kReadyEnd);
    if (end == std::string_view::npos || !output.Put(text.substr(0, end), 0, 0)) return;
    text.remove_prefix(end + 1);
  }
}

/// Words, each with what else it is found by at the same place: parts of identifiers, joined codes, and its stem, at
/// its first places, where that is another.
void PutProse(TokenOutput& output, Stemmer& stemmer, Language language, std::string_view text) {
  WordScanner scanner(text);
  CodeScanner codes(text);
  stemmer.BeginText();
  while (scanner.Next() && output.Put(scanner.Word(), scanner.Begin(), scanner.End())) {
    if (scanner.WordKind() != WordScanner::Kind::kWord) continue;
    for (const std::string& word : codes.At(scanner.Begin(), scanner.End())) {
      if (!output.Put(word, scanner.Begin(), scanner.End(), FTS5_TOKEN_COLOCATED)) return;
    }
    const std::string_view stem = stemmer.StemInText(language, scanner.Word());
    if (!stem.empty() && !output.Put(stem, scanner.Begin(), scanner.End(), FTS5_TOKEN_COLOCATED)) return;
  }
}

int Tokenize(Fts5Tokenizer* tokenizer, void* context, int flags, const char* text, int size, TokenSink sink) {
  const std::string_view all(text == nullptr ? "" : text, static_cast<size_t>(size));
  TokenOutput output(context, sink);
  if ((flags & FTS5_TOKENIZE_QUERY) != 0) {
    (void)output.Put(all, 0, all.size());  // expressions are built from ready words
  } else if (all.starts_with(kGramsMark)) {
    PutGrams(output, all.substr(1));
  } else if (all.starts_with(kReadyMark)) {
    PutReadyWords(output, all.substr(1));
  } else if (all.starts_with(kProseMark)) {
    try {
      PutProse(output, *reinterpret_cast<Stemmer*>(tokenizer), MarkedLanguage(all),
               all.substr(std::min(all.size(), kProseMarkBytes)));
    } catch (const std::bad_alloc&) {
      return SQLITE_NOMEM;
    }
  }
  return output.Result();
}

/// FTS5 makes one for each full-text table of a connection, and uses it in the connection's thread.
int CreateTokenizer(void* /*context*/, const char** /*arguments*/, int /*count*/, Fts5Tokenizer** tokenizer) {
  auto* stemmer = new (std::nothrow) Stemmer;
  *tokenizer = reinterpret_cast<Fts5Tokenizer*>(stemmer);
  return stemmer == nullptr ? SQLITE_NOMEM : SQLITE_OK;
}

void DeleteTokenizer(Fts5Tokenizer* tokenizer) { delete reinterpret_cast<Stemmer*>(tokenizer); }

/// By MetaColumn.
uint8_t PlaceOfColumn(int column) {
  constexpr uint8_t kPlaces[] = {kInNamePart, kInName, kInTitle, kInText, kInText};
  return column >= 0 && column <= kFieldsColumn ? kPlaces[column] : uint8_t{0};
}

/// What the rows of one phrase are collected with.
struct PhraseVisit {
  HitCollector* collector;
  bool content;  ///< the table of contents, which has one column
};

/// All rows of a phrase are one step of SQLite's machine: it is ended here when the request is over.
int Hand(int64_t id, const PhraseVisit& visit, uint8_t count, uint8_t places) {
  const bool goes_on =
      visit.collector->Add(id, visit.content ? count : uint8_t{0}, visit.content ? uint8_t{0} : places);
  if (goes_on) return SQLITE_OK;
  return visit.collector->HasStopped() ? SQLITE_DONE : SQLITE_INTERRUPT;  // the former ends a walk, and is no failure
}

/// Adds up one phrase's occurrences in a row.
int ReadRowHits(const Fts5ExtensionApi* api, Fts5Context* row, int phrase, uint8_t& count, uint8_t& places) {
  Fts5PhraseIter iterator;
  int column = -1;
  int offset = -1;
  const int result = api->xPhraseFirst(row, phrase, &iterator, &column, &offset);
  if (result != SQLITE_OK) return result;
  for (; column >= 0 && count < kCountMax; api->xPhraseNext(row, &iterator, &column, &offset)) {
    ++count;
    places |= PlaceOfColumn(column);
  }
  return SQLITE_OK;
}

/// A row that xQueryPhrase visits: it has the one phrase.
int VisitRow(const Fts5ExtensionApi* api, Fts5Context* row, void* user) {
  const auto* visit = static_cast<const PhraseVisit*>(user);
  uint8_t count = 0;
  uint8_t places = 0;
  const int result = ReadRowHits(api, row, 0, count, places);
  if (result != SQLITE_OK) return result;
  return Hand(api->xRowid(row), *visit, count, places);
}

/// Hands the row under the caller's cursor to the collector.
int CollectRow(const Fts5ExtensionApi* api, Fts5Context* row, PhraseVisit& visit) {
  uint8_t count = 0;
  uint8_t places = 0;
  for (int phrase = 0; phrase < api->xPhraseCount(row); ++phrase) {
    const int result = ReadRowHits(api, row, phrase, count, places);
    if (result != SQLITE_OK) return result;
  }
  return Hand(api->xRowid(row), visit, count, places);
}

/// kova_collect(table, collector, all): with `all` not 0, walks all rows of each phrase of the expression, in place of
/// the caller's cursor; else takes the row under the cursor.
void CollectFunction(const Fts5ExtensionApi* api, Fts5Context* row, sqlite3_context* context, int count,
                     sqlite3_value** arguments) {
  auto* collector =
      count == 2 ? static_cast<HitCollector*>(sqlite3_value_pointer(arguments[0], kCollectorType)) : nullptr;
  if (collector == nullptr) {
    sqlite3_result_error(context, "kova_collect is for the engine alone", -1);
    return;
  }
  PhraseVisit visit = {collector, api->xColumnCount(row) == 1};
  int result = SQLITE_OK;
  if (sqlite3_value_int(arguments[1]) == 0) {
    result = CollectRow(api, row, visit);
  } else {
    for (int phrase = 0; phrase < api->xPhraseCount(row) && result == SQLITE_OK && !collector->HasStopped(); ++phrase) {
      result = api->xQueryPhrase(row, phrase, &visit, &VisitRow);
    }
  }
  if (result != SQLITE_OK && result != SQLITE_DONE) sqlite3_result_error_code(context, result);
}

/// FTS5 gives its functions to C code by this call.
fts5_api* FullTextApi(Database& database) {
  fts5_api* api = nullptr;
  Statement statement = database.Prepare("SELECT fts5(?1)");
  statement.BindPointer(1, &api, "fts5_api_ptr");
  (void)statement.Step();
  if (api == nullptr) database.Fail(SQLITE_ERROR);
  return api;
}

}  // namespace

/// What is kept for an asker at the end does not depend on when this was called, nor on the order of the hits.
void HitCollector::Shorten() {
  if (hits_.size() <= hits_max_) return;
  if (!visible_.IsForAsker()) {
    hits_.erase(hits_.begin(), hits_.end() - static_cast<ptrdiff_t>(hits_max_));
    return;
  }
  std::vector<uint64_t> keys;
  keys.reserve(hits_.size());
  for (const WordHit& hit : hits_) keys.push_back(visible_.PathKey(hit.id));
  const auto last = keys.begin() + static_cast<ptrdiff_t>(hits_max_) - 1;
  std::nth_element(keys.begin(), last, keys.end());
  std::erase_if(hits_, [this, bound = *last](const WordHit& hit) { return visible_.PathKey(hit.id) > bound; });
  shorten_at_ = 2 * hits_.size();
}

HitCollector::~HitCollector() { WorkLimit::Release(held_bytes_); }

/// To twice the size, as a vector does; what a vector has twice while it grows is not counted.
bool HitCollector::Grow() {
  const size_t capacity =
      std::max<size_t>(1024, std::min(2 * hits_.capacity(), std::max(shorten_at_, hits_.size() + 1)));
  const size_t more = (capacity - hits_.capacity()) * sizeof(WordHit);
  if (!WorkLimit::Hold(more)) return false;
  held_bytes_ += more;
  hits_.reserve(capacity);
  return true;
}

/// The hits count for the request until its end, without what was only room for more.
std::vector<WordHit> HitCollector::TakeHits() {
  if (visible_.IsForAsker()) {
    Shorten();
    hits_.shrink_to_fit();
    WorkLimit::Release(held_bytes_ - std::min(held_bytes_, hits_.size() * sizeof(WordHit)));
  }
  held_bytes_ = 0;
  shorten_at_ = 2 * hits_max_;
  return std::exchange(hits_, {});
}

void RegisterFullText(Database& database) {
  fts5_api* api = FullTextApi(database);
  fts5_tokenizer tokenizer = {&CreateTokenizer, &DeleteTokenizer, &Tokenize};
  database.Check(api->xCreateTokenizer(api, "kova", nullptr, &tokenizer, nullptr));
  database.Check(api->xCreateFunction(api, "kova_collect", nullptr, &CollectFunction, nullptr));
  RegisterPositions(database, api);
}

std::string PhraseExpression(const std::vector<std::string>& words, bool prefix) {
  std::string expression;
  for (const std::string& word : words) {
    if (!expression.empty()) expression += " + ";
    expression += '"';
    for (const char c : word) {
      if (c == '"') expression += '"';
      expression += c;
    }
    expression += '"';
  }
  return prefix ? expression + " *" : expression;
}

void Collect(Database& database, const char* table, const std::string& expression, bool prefix,
             HitCollector& collector) {
  const std::string name(table);
  // To look for the beginning of a word, all words that have it are merged: that is done once, for the cursor.
  // Otherwise the rows are walked inside the function, which costs less a row.
  const std::string where = " FROM " + name + " WHERE " + name + " MATCH ?2";
  Statement statement =
      database.Prepare("SELECT kova_collect(" + name + ", ?1, " + (prefix ? "0)" + where : "1)" + where + " LIMIT 1"));
  statement.BindPointer(1, &collector, kCollectorType).Bind(2, std::string_view(expression));
  while (!collector.HasStopped() && statement.Step()) {
  }
}

bool HasExpression(Database& database, const char* table, const std::string& expression, int64_t id) {
  if (expression.empty()) return false;
  const std::string name(table);
  Statement statement = database.Prepare("SELECT 1 FROM " + name + " WHERE " + name + " MATCH ?1 AND rowid = ?2");
  return statement.Bind(1, std::string_view(expression)).Bind(2, id).Step();
}

}  // namespace ferrox::engine
