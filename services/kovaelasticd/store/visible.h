#pragma once

#include <cstdint>
#include <memory>
#include <optional>

#include "services/kovaelasticd/store/asker.h"
#include "services/kovaelasticd/store/doc_set.h"
#include "services/kovaelasticd/store/places.h"
#include "services/kovaelasticd/store/readable_documents.h"
#include "services/kovaelasticd/store/store_rows.h"

namespace ferrox::engine {

struct StoreReader;

/// The documents that exist for one search: for an ordinary user those that they may read, else all but those that are
/// deleted and still in the tables. Every set and every hit of a search goes through this one before it is counted, so
/// that nothing else tells of other documents. For one snapshot and one thread.
class Visible {
 public:
  /// `reader`, which must outlive this as `asker` must, has a transaction open. Null: for who may see everything.
  /// @throws Error kEngineStorage; kEngineIndexPreparing while names are not marked by the asker's rules.
  Visible(StoreReader& reader, const Asker* asker);

  bool Contains(int64_t id) const {
    if (IsForAsker()) return readable_ != nullptr && readable_->Documents().Contains(id);
    return hidden_ == nullptr || !hidden_->Contains(id);
  }
  /// Removes what is not visible.
  void Trim(DocSet& documents) const;
  DocSet All() const;

  // Sums of the visible documents; lengths are rough for an asker (LengthOfClass).
  int64_t Documents() const { return documents_; }
  int64_t WithContent() const { return with_content_; }
  int64_t TextBytes() const { return text_bytes_; }
  int64_t Version() const { return version_; }  ///< of the snapshot

  /// Whether an ordinary user asks: then no number of a document may decide what they see, since numbers tell of other
  /// documents. PathKey decides in their place.
  bool IsForAsker() const { return asker_ != nullptr; }
  /// The folder that is the share's root, for an asker only: it may end with "/".
  const std::string& ShareRoot() const { return asker_->share_root; }
  /// PathKeys; for an asker only.
  uint64_t PathKey(int64_t id) const {
    if (places_ == nullptr) return 0;
    if (!keys_.has_value()) keys_.emplace(*places_);
    return keys_->Of(id);
  }

 private:
  StoreReader& reader_;
  const Asker* const asker_;
  const DocSet* const hidden_;
  std::shared_ptr<const Places> places_;
  std::shared_ptr<const ReadableDocuments> readable_;  ///< null for an asker: nothing is readable
  mutable std::optional<PathKeys> keys_;               ///< once they are needed
  int64_t documents_ = 0, with_content_ = 0, text_bytes_ = 0, version_ = 0;
};

}  // namespace ferrox::engine
