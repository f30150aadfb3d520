#pragma once

#include <cstdint>
#include <optional>
#include <string>
#include <utility>
#include <vector>

#include "services/kovaelasticd/store/document.h"
#include "services/kovaelasticd/store/folder_tree.h"
#include "services/kovaelasticd/store/index_store.h"
#include "services/kovaelasticd/store/sqlite_db.h"
#include "wire/folder_digest.h"

namespace ferrox::engine {

/// Goes through the folders at and below a path in the order in which a listing meets what is in them, which is the
/// byte order of their paths with the "/" at the end, and makes the digests of those that have documents directly in
/// them. Rows are read as they lie in the file: nothing of a document is unpacked but what the digest is made of.
/// Holds one name for each folder on the way down. For the thread that writes; every member throws Error
/// kEngineStorage. Neither folders nor documents must be changed meanwhile.
class FolderDigests {
 public:
  FolderDigests(Database& database, FolderTree& tree, const FieldNames& names, const DigestRequest& request);

  /// The next folder with documents directly in it; nothing behind the last.
  std::optional<FolderState> Next();
  /// How many documents were looked at.
  int64_t Documents() const { return documents_; }

 private:
  /// A folder on the way, and the name of the one below it that was visited last; "": none was.
  struct Level {
    int64_t folder;
    size_t path_bytes;  ///< of path_
    std::string last_child;
  };
  struct Numbers {
    int64_t stamp, need_meta, content_type, version, error, cut;
  };

  bool Advance();
  void Enter(int64_t folder, const std::string& name);
  FolderState Digest(int64_t folder);
  void AddDocument(const Statement& row, wire::FolderDigest& digest, FolderState& state) const;

  Database& database_;
  const DigestRequest& request_;
  const Numbers numbers_;     ///< of fields in packed rows; 0: nobody has it
  const uint32_t has_error_;  ///< the bit for "_KOVAExtractError" of rows' derived fields
  std::string path_;          ///< of the folder at hand, with "/"
  std::vector<Level> levels_;
  bool first_ = false;  ///< the folder at hand is yet to be returned
  int64_t documents_ = 0;
};

}  // namespace ferrox::engine
