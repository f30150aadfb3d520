#include "services/kovaelasticd/store/sqlite_store.h"

#include <algorithm>

#include "services/kovaelasticd/store/folder_digests.h"
#include "services/kovaelasticd/store/store_stat.h"

namespace ferrox::engine {

IndexStore::~IndexStore() = default;

SqliteStore::SqliteStore(const std::string& path, bool create, std::shared_ptr<const Schema> schema)
    : schema_(std::move(schema)), catalogue_(path, create), readers_(path) {}

SqliteStore::~SqliteStore() = default;

void SqliteStore::Commit() {
  if (!catalogue_.InTransaction()) return;
  words_.Flush();
  catalogue_.Commit();
  uncommitted_bytes_ = 0;
  preparing_ = catalogue_.Sums().preparing;
}

void SqliteStore::Rollback() {
  words_.Forget();
  uncommitted_bytes_ = 0;
  clearing_.Forget();
  catalogue_.Rollback();
}

void SqliteStore::LimitPages(int64_t pages) {
  const std::string most = std::to_string(pages == 0 ? 4294967294 : pages);
  (void)catalogue_.Connection().QueryInt(("PRAGMA max_page_count = " + most).c_str());
}

Json::Value SqliteStore::LoadEntry(const StoredDocument& stored, const std::vector<std::string>& fields) {
  Json::Value entry = UnpackDocument(stored.row, catalogue_.Names(), fields);
  const auto names = [&fields](const char* name) {
    return std::find(fields.begin(), fields.end(), name) != fields.end();
  };
  const bool wants_access = stored.row.access != AccessRecords::kNone && (fields.empty() || names(field::kAccess));
  if (wants_access) entry[field::kAccess] = catalogue_.Access().TextOf(stored.row.access);
  if (names(field::kTextContent) && stored.text_bytes > 0) entry[field::kTextContent] = words_.Text(stored.id);
  return entry;
}

void SqliteStore::Get(const GetRequest& request, const std::function<void(Json::Value)>& take) {
  catalogue_.List(request, [&](const StoredDocument& stored) { take(LoadEntry(stored, request.fields)); });
}

DigestPage SqliteStore::Digests(const DigestRequest& request) {
  DigestPage page;
  FolderDigests digests(catalogue_.Connection(), catalogue_.Tree(), catalogue_.Names(), request);
  while (!page.more) {
    std::optional<FolderState> folder = digests.Next();
    if (!folder.has_value()) break;
    page.folders.push_back(std::move(*folder));
    page.more = std::ssize(page.folders) >= request.limit || digests.Documents() >= request.most_documents;
  }
  return page;
}

void SqliteStore::ClearSome() {
  if (Uncleared() == 0 || catalogue_.InTransaction()) return;
  catalogue_.Begin();
  clearing_.Turn();
  Commit();
  if (Uncleared() > 0 || !suggestions_wanted_) return;
  RebuildSuggestions();
  Commit();
}

void SqliteStore::ObeySome(const std::string& rules) {
  if (Obeys(rules) || catalogue_.InTransaction()) return;
  catalogue_.Begin();
  catalogue_.MarkNames(rules);
  Commit();
}

/// Words of documents that are to be cleared would be counted: it waits for their end.
void SqliteStore::RebuildSuggestions() {
  suggestions_wanted_ = Uncleared() > 0;
  if (suggestions_wanted_) return;
  catalogue_.Begin();
  words_.Flush();
  words_.RebuildSuggestions();
  uncommitted_bytes_ += 1;  // so that there is something to commit
}

/// What searches have in memory, and the order of a listing that ended before its last page.
std::optional<std::chrono::steady_clock::time_point> SqliteStore::NextGiveBack() const {
  const auto places = readers_.NextGiveBack();
  const auto listed = catalogue_.Listed().Used();
  if (!listed.has_value()) return places;
  const auto end = *listed + PlacesCache::kIdle;
  return places.has_value() ? std::min(*places, end) : end;
}

void SqliteStore::GiveBack(std::chrono::steady_clock::time_point now) {
  readers_.GiveBack(now);
  if (const auto listed = catalogue_.Listed().Used(); listed.has_value() && now >= *listed + PlacesCache::kIdle)
    catalogue_.Listed().Forget();
}

void SqliteStore::EndPreparing() {
  if (!catalogue_.Sums().preparing) return;
  catalogue_.Begin();
  catalogue_.Sums().preparing = false;
  Changed(0);
}

StoreStat SqliteStore::Stat() { return ReadStat(readers_); }

}  // namespace ferrox::engine
