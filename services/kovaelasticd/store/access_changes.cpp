// What changes the access records of a SqliteStore's documents and folders.
#include "base/file_stamp.h"
#include "services/kovaelasticd/store/packed_fields.h"
#include "services/kovaelasticd/store/sqlite_store.h"

namespace ferrox::engine {

namespace {

namespace names = fileindex::elastic;

}  // namespace

/// One call of SetAccess. Neighbours mostly lie in one folder and have one record, so that both are looked up once for
/// them. Rows are written without a look at their words, since no member that is set here makes any; where one does,
/// the document goes the long way.
class SqliteStore::AccessPass {
 public:
  explicit AccessPass(SqliteStore& store)
      : store_(store),
        catalogue_(store.catalogue_),
        stamp_field_(catalogue_.Names().NumberOf(FileLinks::kStamp)),
        owner_field_(catalogue_.Names().NumberOf(names::kKOVAMDOwnerUserID)),
        group_field_(catalogue_.Names().NumberOf(names::kKOVAMDOwnerGroupID)),
        changed_field_(catalogue_.Names().NumberOf(names::kKOVAMDAttributeChangeDate)),
        find_(catalogue_.Connection().Prepare(
            "SELECT id, kind, access, packed FROM docs WHERE folder = ?1 AND leaf = ?2")),
        write_(catalogue_.Connection().Prepare("UPDATE docs SET access = ?2, packed = ?3 WHERE id = ?1")) {
    changed_has_words_ = store.schema_->IsPlain(names::kKOVAMDAttributeChangeDate);
  }

  enum class Found { kSame, kDiffering, kMissing };
  Found Apply(const AccessChange& change) {
    LookUpRecord(change.access);
    Row row;
    if (!Find(change.path, row)) {
      catalogue_.GiveFolder(change.path, access_);
      return Found::kMissing;
    }
    const auto stored = base::FileStamp::Parse(TextField(row.packed, stamp_field_).value_or(""));
    const auto seen = base::FileStamp::Parse(change.stamp);
    const bool same = stored.has_value() && seen.has_value() && stored->SameContent(*seen);
    if (!same) {
      Write(row, row.packed, change);
    } else if (HasOtherWords(row)) {
      store_.Set(change.path, Members(change, *seen));
    } else {
      std::string packed = row.packed;
      ReplaceField(packed, stamp_field_, change.stamp);
      ReplaceField(packed, changed_field_, Json::Int64(seen->ChangedSec()));
      Write(row, packed, change);
      if (!row.is_folder) catalogue_.Links().OnSeen(row.id, change.stamp);
    }
    return same ? Found::kSame : Found::kDiffering;
  }

 private:
  struct Row {
    int64_t id = 0;
    bool is_folder = false;
    int64_t access = AccessRecords::kNone;
    std::string packed;
  };

  void LookUpRecord(const std::string& text) {
    if (text == access_text_) return;
    access_ = catalogue_.Access().NumberOf(text);
    access_text_ = text;
    const size_t colon = text.find(':');
    owner_ = text.substr(0, colon);
    group_ = text.substr(colon + 1, text.find(':', colon + 1) - colon - 1);
  }

  bool Find(const std::string& path, Row& row) {
    const std::string_view folder_path = FolderTree::FolderOf(path);
    if (folder_path != folder_path_) {
      folder_ = catalogue_.Tree().Find(folder_path);
      folder_path_ = folder_path;
    }
    find_.Bind(1, folder_).Bind(2, FolderTree::LeafOf(path));
    const bool there = find_.Step();
    if (there) row = {find_.Int(0), find_.Int(1) == kFolder, find_.Int(2), std::string(find_.Text(3))};
    find_.Reset();
    return there;
  }

  /// Whether words of the document change with its members, or fields come to it that it does not have yet.
  bool HasOtherWords(const Row& row) const {
    return changed_has_words_ || changed_field_ == 0 || TextField(row.packed, owner_field_) != owner_ ||
           TextField(row.packed, group_field_) != group_;
  }

  Json::Value Members(const AccessChange& change, const base::FileStamp& seen) const {
    Json::Value members;
    members[FileLinks::kStamp] = change.stamp;
    members[field::kAccess] = change.access;
    members[names::kKOVAMDOwnerUserID] = owner_;
    members[names::kKOVAMDOwnerGroupID] = group_;
    members[names::kKOVAMDAttributeChangeDate] = Json::Int64(seen.ChangedSec());
    return members;
  }

  void Write(const Row& row, const std::string& packed, const AccessChange& change) {
    if (row.access == access_ && row.packed == packed) return;
    write_.Bind(1, row.id).Bind(2, access_).BindBlob(3, packed).Run();
    catalogue_.Sums().without_access -= row.access == AccessRecords::kNone ? 1 : 0;
    if (row.is_folder) catalogue_.GiveFolder(change.path, access_);
    store_.Changed(0);
  }

  SqliteStore& store_;
  Catalogue& catalogue_;
  const int64_t stamp_field_, owner_field_, group_field_, changed_field_;  ///< in packed fields; 0: nobody has it
  bool changed_has_words_;
  Statement find_, write_;
  std::string folder_path_;
  int64_t folder_ = FolderTree::kNone;
  std::string access_text_, owner_, group_;  ///< of the record at hand
  int64_t access_ = AccessRecords::kNone;
};

AccessReport SqliteStore::SetAccess(const std::vector<AccessChange>& changes) {
  catalogue_.Begin();
  AccessPass pass(*this);
  AccessReport report;
  for (size_t i = 0; i < changes.size(); ++i) {
    const AccessPass::Found found = pass.Apply(changes[i]);
    if (found == AccessPass::Found::kMissing) report.missing.push_back(i);
    if (found == AccessPass::Found::kDiffering) report.differing.push_back(i);
  }
  return report;
}

}  // namespace ferrox::engine
