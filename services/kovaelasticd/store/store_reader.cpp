#include "services/kovaelasticd/store/store_reader.h"

#include <algorithm>

#include "services/kovaelasticd/store/fts.h"
#include "services/kovaelasticd/store/store_rows.h"
#include "services/kovaelasticd/store/work_limit.h"

namespace ferrox::engine {

namespace {

/// More searches at a time than that open connections of their own, each with a page cache of up to 8 MiB.
constexpr size_t kIdleMax = 4;

}  // namespace

StoreReader::StoreReader(const std::string& path, HiddenDocuments& hidden_documents, PlacesCache& shared_places,
                         ReadableCache& shared_readable, WordListCache& shared_words)
    : database(path, Database::Mode::kRead),
      places(shared_places),
      readable(shared_readable),
      words(shared_words),
      hidden_documents_(hidden_documents) {
  database.Execute("PRAGMA cache_size = -8192");
  RegisterFullText(database);
  database.Execute("CREATE VIRTUAL TABLE temp.content_terms USING fts5vocab('main', 'content_fts', 'instance')");
  database.Execute("CREATE VIRTUAL TABLE temp.meta_terms USING fts5vocab('main', 'meta_fts', 'instance')");
  database.Execute("PRAGMA query_only = 1");
}

void StoreReader::Refresh() {
  // Differs from the last one when another connection has committed since.
  const int64_t version = database.QueryInt("PRAGMA data_version");
  if (version == seen_version_) return;
  seen_version_ = version;
  tree.Forget();
  LoadFieldNames(database, names);
  hidden = hidden_documents_.Of(database);
}

std::unique_ptr<StoreReader> ReaderPool::Borrow() {
  {
    const base::MutexLock guard(mutex_);
    if (!idle_.empty()) {
      std::unique_ptr<StoreReader> reader = std::move(idle_.back());
      idle_.pop_back();
      WorkLimit::Apply(reader->database.Handle());
      return reader;
    }
  }
  auto reader = std::make_unique<StoreReader>(path_, hidden_documents_, places_, readable_, words_);
  WorkLimit::Apply(reader->database.Handle());
  return reader;
}

void ReaderPool::Return(std::unique_ptr<StoreReader> reader) {
  const base::MutexLock guard(mutex_);
  if (idle_.size() < kIdleMax) idle_.push_back(std::move(reader));
}

std::optional<PlacesCache::SteadyClock::time_point> ReaderPool::NextGiveBack() const {
  const auto places = places_.NextGiveBack();
  const auto words = words_.Used();
  if (!words.has_value()) return places;
  const auto end = *words + PlacesCache::kIdle;
  return places.has_value() ? std::min(*places, end) : end;
}

void ReaderPool::GiveBack(PlacesCache::SteadyClock::time_point now) {
  if (const auto words = words_.Used(); words.has_value() && now >= *words + PlacesCache::kIdle) words_.GiveBack();
  places_.GiveBack(now);
  if (!places_.IsLoaded()) readable_.GiveBack();
}

}  // namespace ferrox::engine
