#pragma once

#include <cstdint>
#include <optional>
#include <string>
#include <string_view>

#include "services/kovaelasticd/store/doc_set.h"
#include "services/kovaelasticd/store/document.h"
#include "services/kovaelasticd/store/store_rows.h"

namespace ferrox::engine {

/// One half of an index: the texts of documents and the words that searches look for, by documents' numbers. Which
/// document a number is, where it lies and who may read it is the other half's (Catalogue), so that a folder's move or
/// a change of rights is nothing to this one.
///
/// For the thread that writes. What is added or removed may wait in memory until Flush. Every member that writes throws
/// Error kEngineStorage, after which Forget goes with the rollback.
class Words {
 public:
  Words() = default;
  Words(const Words&) = delete;
  Words& operator=(const Words&) = delete;
  virtual ~Words() = default;

  /// A new document. Empty text: it has none.
  virtual void Add(int64_t id, MetaText meta, std::string_view text) = 0;
  /// A document that `before` describes gets other words; without `text` it keeps the text that it has.
  virtual void Replace(const StoredDocument& before, MetaText meta, std::optional<std::string_view> text) = 0;
  virtual void Remove(const StoredDocument& before) = 0;
  /// Counts `bytes` of changed text, and writes all changes when too much of it waits.
  virtual void Changed(int64_t bytes) = 0;
  /// The text of a document, changed or not; "" when it has none.
  virtual std::string Text(int64_t id) = 0;
  /// Writes all changes.
  virtual void Flush() = 0;
  /// Drops the changes that are not written.
  virtual void Forget() = 0;
  /// Rebuilds the words that are suggested when a search finds nothing, after a Flush.
  virtual void RebuildSuggestions() = 0;

  enum class Purged { kMore, kDone, kImpossible };
  /// Removes the words of many documents together, where that costs less than Remove for each: a piece of it, of about
  /// `pages` pages of the store, in the transaction that is open. To be called with the same documents until kDone;
  /// RemovePurged for each takes out what is left then. kImpossible: nothing is removed, and must be with Remove.
  virtual Purged Purge(const DocSet& documents, int64_t pages) = 0;
  /// Ends a purge, also one that was not done.
  virtual void EndPurge() = 0;
  virtual void RemovePurged(int64_t id) = 0;
};

}  // namespace ferrox::engine
