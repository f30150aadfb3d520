#pragma once

#include <functional>
#include <string>
#include <vector>

#include "services/fileindexd/access_batch.h"
#include "services/fileindexd/document_writer.h"
#include "services/fileindexd/pass_commits.h"
#include "services/fileindexd/pass_context.h"

namespace ferrox::indexd {

/// A file with several names (hard links) has a document for each of its names in the share, but a change is queued
/// under one name alone. This refreshes the documents of the other names, as tasks. Belongs to the worker's thread.
class LinkedDocuments {
 public:
  /// All outlive it.
  LinkedDocuments(const PassContext& context, DocumentWriter& writer, PassCommits& commits, AccessBatch& access)
      : context_(context), writer_(writer), commits_(commits), access_(access) {}

  /// Of files that changed under a name outside of the share, or one that is gone: the queue has only their inode
  /// numbers, and the index finds the documents. @throws Interrupted; Error.
  void RefreshChangedFiles();
  /// Of files that changed in the share: the index has noted the documents whose stamp is not that of the one that was
  /// written. @throws Interrupted; Error.
  void RefreshSuspects();

 private:
  using ListPage = std::function<std::vector<IndexedEntry>(const std::string& after, unsigned limit)>;

  bool IsCurrent(const IndexedEntry& entry) const;
  void RefreshPages(const ListPage& list, const std::function<bool(const IndexedEntry&)>& skip);

  const PassContext& context_;
  DocumentWriter& writer_;
  PassCommits& commits_;
  AccessBatch& access_;
};

}  // namespace ferrox::indexd
