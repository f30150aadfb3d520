#pragma once

#include <atomic>
#include <chrono>
#include <memory>
#include <optional>
#include <string>
#include <vector>

#include "services/kovaelasticd/store/catalogue.h"
#include "services/kovaelasticd/store/clearing.h"
#include "services/kovaelasticd/store/index_store.h"
#include "services/kovaelasticd/store/sqlite_words.h"
#include "services/kovaelasticd/store/store_reader.h"
#include "services/kovaelasticd/text/schema.h"

namespace ferrox::engine {

/// An index in one SQLite file (docs/formats/engine.md lists its tables), made of two halves: Catalogue, whose rows are
/// written at once, and Words, which are written when the changes are committed or have grown large. Both change by one
/// connection and in one transaction. Searches use connections of their own (ReaderPool) in SQLite's write-ahead mode:
/// each sees the last commit as it began, and none waits for a writer.
class SqliteStore : public IndexStore {
 public:
  /// Opens the file, or makes it with `create` when it is missing.
  SqliteStore(const std::string& path, bool create, std::shared_ptr<const Schema> schema);
  ~SqliteStore() override;

  void Upsert(const std::string& path, const Json::Value& document) override;
  void Set(const std::string& path, const Json::Value& changes) override;
  void MoveFolder(const std::string& path, const std::string& stamp, const Json::Value& changes) override;
  AccessReport SetAccess(const std::vector<AccessChange>& changes) override;
  void EndPreparing() override;
  void Delete(const std::string& path) override;
  void DeletePrefix(const std::string& prefix) override;
  void Get(const GetRequest& request, const std::function<void(Json::Value)>& take) override;
  DigestPage Digests(const DigestRequest& request) override;
  void Commit() override;
  void Rollback() override;
  int64_t UncommittedBytes() const override { return uncommitted_bytes_; }
  int64_t Uncleared() const override { return catalogue_.Sums().clearing; }
  void ClearSome() override;
  bool Obeys(const std::string& rules) const override { return catalogue_.Marks().Obey(rules); }
  void ObeySome(const std::string& rules) override;
  std::optional<std::chrono::steady_clock::time_point> NextGiveBack() const override;
  void GiveBack(std::chrono::steady_clock::time_point now) override;
  void RebuildSuggestions() override;
  SearchReply Search(const SearchRequest& request) override;  ///< defined in search/, whose parts it is made of
  StoreStat Stat() override;
  bool Preparing() const override { return preparing_; }

  /// The largest size of the file, in pages; for tests of a full disk. 0: no limit.
  void LimitPages(int64_t pages);
  /// For tests with few documents.
  void LimitClearing(const ClearingLimits& limits) { clearing_.SetLimits(limits); }

 private:
  void Remove(const StoredDocument& stored);
  void RemoveAt(const std::string& path);
  void RemoveOneByOne(const std::string& prefix);
  void MoveOneByOne(const std::string& from, const std::string& to);
  class AccessPass;  ///< access_changes.cpp
  /// To be called after each change, with the bytes of text that it changed.
  void Changed(int64_t bytes);
  /// A document as Get returns it.
  Json::Value LoadEntry(const StoredDocument& stored, const std::vector<std::string>& fields);

  const std::shared_ptr<const Schema> schema_;
  // Of the thread that writes.
  Catalogue catalogue_;
  SqliteWords words_{catalogue_.Connection(), catalogue_.Names(), schema_};
  Clearing clearing_{catalogue_, words_};
  int64_t uncommitted_bytes_ = 0;    ///< for the automatic commit: texts, and a fixed amount for each change
  bool suggestions_wanted_ = false;  ///< once nothing is left to be cleared
  std::atomic<bool> preparing_{catalogue_.Sums().preparing};

  ReaderPool readers_;  ///< for Search and Stat, on any thread
};

}  // namespace ferrox::engine
