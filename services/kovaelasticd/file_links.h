#pragma once

#include <cstdint>
#include <functional>
#include <string>

#include "services/kovaelasticd/document.h"
#include "services/kovaelasticd/sqlite_db.h"

namespace ferrox::engine {

/// Which documents are of one file under several names. Of a change that is seen under one name only, the documents of
/// the others do not know: they are noted as suspects, until they are written again. What tells files apart is the
/// number behind the last "." of "_KOVAStamp"; folders have no other names.
class FileLinks {
 public:
  /// The member of a document that tells what was seen of its file.
  static constexpr char kStamp[] = "_KOVAStamp";

  FileLinks(Database& database, const FieldNames& names) : database_(database), names_(names) {}

  /// Makes the tables where they are missing.
  void MakeTables();
  /// A document is written behind a look at its file (`before` null: it is new) or removed (`after` null).
  void OnChange(int64_t id, const DocRow* before, const DocRow* after);

 private:
  std::string StampOf(const DocRow* row) const;
  void MarkOthers(int64_t file, int64_t id, const std::string& stamp);

  Database& database_;
  const FieldNames& names_;
};

}  // namespace ferrox::engine
