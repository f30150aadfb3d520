#include "services/kovaelasticd/store/hidden_documents.h"

#include "services/kovaelasticd/store/folder_tree.h"
#include "services/kovaelasticd/store/store_rows.h"

namespace ferrox::engine {

std::shared_ptr<const DocSet> HiddenDocuments::Of(Database& database) {
  const std::string newest = FolderTree::NewestGone(database);
  std::string known;
  std::shared_ptr<const DocSet> set;
  {
    const base::MutexLock guard(mutex_);
    if (newest.empty()) set_.reset();
    if (set_ == nullptr) newest_.clear();
    if (newest_ <= newest) {
      known = newest_;
      set = set_;
    }
  }
  if (known == newest) return set;
  auto grown = set == nullptr ? std::make_shared<DocSet>() : std::make_shared<DocSet>(*set);
  FolderTree tree(database);
  for (const int64_t gone : FolderTree::GoneAfter(database, known)) {
    AddDocumentsIn(database, tree.AtAndBelow(gone), *grown);
  }
  const base::MutexLock guard(mutex_);
  if (newest_ < newest) {
    newest_ = newest;
    set_ = grown;
  }
  return grown;
}

}  // namespace ferrox::engine
