#pragma once

#include <cstdint>
#include <functional>
#include <string>

#include "services/kovaelasticd/store/doc_set.h"
#include "services/kovaelasticd/store/document.h"
#include "services/kovaelasticd/store/folder_tree.h"
#include "services/kovaelasticd/store/sqlite_db.h"
#include "wire/fields.h"

namespace ferrox::engine {

/// Which documents are of one file under several names (hard links). A change of the file is seen under one name, and
/// the documents of the others are then out of date: they are noted as suspects until they are written again. Files are
/// told apart by the inode number behind the last "." of "_KOVAStamp"; folders have no other names.
class FileLinks {
 public:
  /// The member of a document that tells what was seen of its file.
  static constexpr auto& kStamp = fileindex::elastic::k_KOVAStamp;

  /// All must outlive this; `names` are those that the rows are packed with.
  FileLinks(Database& database, FolderTree& tree, const FieldNames& names)
      : database_(database), tree_(tree), names_(names) {}

  /// Makes the tables where they are missing.
  void MakeTables();
  /// A document is written behind a look at its file (`before` null: it is new) or removed (`after` null).
  void OnChange(int64_t id, const DocRow* before, const DocRow* after);
  /// The file of the document has another stamp, but is still the same.
  void OnSeen(int64_t id, const std::string& stamp);
  /// Documents are to be cleared: the others of their files are noted as suspects. Costs a walk over all files.
  void OnTakenOut(const DocSet& documents);
  /// A document that was taken out is removed.
  void Forget(int64_t id, const DocRow& row);

 private:
  /// "" for a folder, a missing row and a row without stamp.
  std::string StampOf(const DocRow* row) const;
  /// Notes the other documents of `file` as suspects, apart from those that have the same stamp.
  void MarkOthers(int64_t file, int64_t id, const std::string& stamp);
  void Remove(int64_t file, int64_t id);

  Database& database_;
  FolderTree& tree_;
  const FieldNames& names_;
};

}  // namespace ferrox::engine
