#include "services/kovaelasticd/store/word_list_cache.h"

#include <malloc.h>

#include <algorithm>
#include <functional>
#include <string>
#include <string_view>
#include <utility>

#include "services/kovaelasticd/store/work_limit.h"

namespace ferrox::engine {

namespace {

/// What terms of words begin with in FTS5's pages; others have it for the beginnings of words.
constexpr char kWordTerm = '0';
/// The work limit is looked at so often.
constexpr int64_t kPagesAtOnce = 500;

size_t HashOf(const std::string& page) { return std::hash<std::string>()(page); }

/// Whether what follows a term, as far as it is on its page, is one entry.
bool IsOneEntry(std::string_view list, bool goes_on) {
  FtsNumbers entry(list);
  (void)entry.Next();
  entry.Skip(entry.Next() / 2);
  return !goes_on && entry.AtEnd();
}

/// Appends the words that begin on a page. @throws IndexDamaged.
void AppendWords(std::string_view page, std::vector<size_t>& places, std::string& term, WordList& words) {
  const auto fail = [] { throw IndexDamaged("a page of words is not as it must be"); };
  if (!ReadFtsTermPlaces(page, places)) fail();
  for (size_t i = 0; i + 1 < places.size(); ++i) {
    const std::string_view bytes = page.substr(places[i], places[i + 1] - places[i]);
    FtsNumbers head(bytes);
    const uint64_t kept = i == 0 ? 0 : head.Next();
    const uint64_t added = head.Next();
    const size_t at = head.At();
    if (kept > term.size() || added > bytes.size()) fail();
    head.Skip(added);
    if (head.Failed()) fail();
    term.resize(kept);
    term += bytes.substr(at, added);
    const std::string_view word = std::string_view(term).substr(term.empty() ? 0 : 1);
    if (!term.starts_with(kWordTerm) || !WordList::Takes(word)) continue;
    words.Append(word, !IsOneEntry(bytes.substr(head.At()), i + 2 == places.size()));
  }
}

}  // namespace

std::shared_ptr<const WordList> WordListCache::Latest(int64_t version) {
  const base::MutexLock guard(mutex_);
  used_ = SteadyClock::now();
  return version_ >= version ? words_ : nullptr;
}

std::shared_ptr<const WordList> WordListCache::Load(Database& database, int64_t version) {
  if (auto words = Latest(version); words != nullptr) return words;
  const base::MutexLock loading(load_mutex_);
  if (auto words = Latest(version); words != nullptr) return words;
  int64_t pages = kTurnPages;
  const bool complete = !HasTooMany() && ReadTable(database, "content_fts", content_, pages) &&
                        ReadTable(database, "meta_fts", meta_, pages) && !HasTooMany();
  if (!complete) return nullptr;
  const base::MutexLock guard(mutex_);
  if (reading_ != nullptr) words_ = std::move(reading_);
  version_ = version;
  return words_;
}

bool WordListCache::ReadTable(Database& database, const char* table, ReadSegments& read, int64_t& pages) {
  FtsPages stored(database, table);
  std::vector<FtsSegment> segments;
  if (!stored.ReadSegments(segments)) return false;
  ReadSegments still;
  for (const FtsSegment& segment : segments) {
    ReadSegment now = {segment.number, segment.first - 1, 0};
    for (const ReadSegment& known : read) {
      const bool is_same = known.number == segment.number && known.last <= segment.last &&
                           known.last_page_hash == HashOf(stored.ReadPage(known.number, known.last));
      if (is_same) now = known;
    }
    while (now.last < segment.last && pages > 0 && !HasTooMany()) {
      WorkLimit::Check();
      const int64_t to = std::min({segment.last, now.last + pages, now.last + kPagesAtOnce});
      pages -= to - now.last;
      ReadPages(stored, now, now.last + 1, to);
    }
    still.push_back(now);
  }
  read = std::move(still);
  return pages > 0;
}

void WordListCache::ReadPages(FtsPages& table, ReadSegment& segment, int64_t from, int64_t to) {
  WordList words;
  std::vector<size_t> places;
  std::string term;
  size_t hash = 0;
  for (int64_t number = from; number <= to; ++number) {
    const std::string page = table.ReadPage(segment.number, number);
    AppendWords(page, places, term, words);
    if (number == to) hash = HashOf(page);
  }
  if (reading_ == nullptr) {
    const base::MutexLock guard(mutex_);
    reading_ = words_ == nullptr ? std::make_unique<WordList>() : std::make_unique<WordList>(*words_);
  }
  reading_->Merge(words);
  segment.last = to;
  segment.last_page_hash = hash;
}

std::optional<WordListCache::SteadyClock::time_point> WordListCache::Used() const {
  const base::MutexLock guard(mutex_);
  return used_;
}

void WordListCache::GiveBack() {
  {
    const base::MutexLock loading(load_mutex_);
    const base::MutexLock guard(mutex_);
    reading_.reset();
    words_.reset();
    content_.clear();
    meta_.clear();
    version_ = -1;
    used_.reset();
  }
  (void)malloc_trim(0);
}

}  // namespace ferrox::engine
