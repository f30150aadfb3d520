#pragma once

#include <cstdint>
#include <memory>
#include <optional>
#include <string>
#include <vector>

#include "services/kovaelasticd/store/doc_set.h"
#include "services/kovaelasticd/store/store_reader.h"

namespace ferrox::engine {

/// The condition `path:`: the document at a path, and all below it. For one query and one snapshot. Members throw Error
/// kEngineStorage.
///
/// Few documents are looked at one by one, by their rows; of a small part of the tree each folder's documents are
/// listed. All else goes by the index's places in memory, which are read for it when nobody has needed them lately.
class PathCondition {
 public:
  /// `version` is that of the snapshot that `reader`, which must outlive this, has a transaction on. `path` has no "/"
  /// at its end, so the top is "".
  PathCondition(StoreReader& reader, int64_t version, const std::string& path);

  DocSet AllDocuments();
  /// Keeps the documents for which the condition holds (`wanted`) or does not.
  void Apply(DocSet& documents, bool wanted);

 private:
  bool HoldsByRow(int64_t id);
  /// The folder and those below it; nothing when there are more than `most`.
  std::optional<std::vector<int64_t>> FewFolders(size_t most);
  DocSet DocumentsIn(const std::vector<int64_t>& folders);

  StoreReader& reader_;
  const int64_t version_;
  const std::string path_;
  int64_t itself_ = -1;  ///< the document at the path; -1: there is none
  int64_t folder_;       ///< what is below it lies in there; kNone: there is none
};

}  // namespace ferrox::engine
