#include "services/kovaelasticd/store/file_links.h"

#include <optional>
#include <vector>

#include "base/file_stamp.h"
#include "services/kovaelasticd/store/packed_fields.h"
#include "services/kovaelasticd/store/store_rows.h"

namespace ferrox::engine {

namespace {

/// 0: not known.
int64_t FileOf(const std::string& stamp) { return static_cast<int64_t>(base::FileNumber(stamp)); }

}  // namespace

void FileLinks::MakeTables() {
  database_.Execute("CREATE TABLE IF NOT EXISTS files(file INTEGER, id INTEGER, PRIMARY KEY(file, id)) WITHOUT ROWID");
  database_.Execute("CREATE TABLE IF NOT EXISTS suspects(id INTEGER PRIMARY KEY)");
}

std::string FileLinks::StampOf(const DocRow* row) const {
  if (row == nullptr || row->kind == kFolder) return "";
  return std::string(TextField(row->packed, names_.NumberOf(kStamp)).value_or(""));
}

void FileLinks::OnChange(int64_t id, const DocRow* before, const DocRow* after) {
  const std::string old_stamp = StampOf(before);
  const std::string stamp = StampOf(after);
  database_.Prepare("DELETE FROM suspects WHERE id = ?1").Bind(1, id).Run();
  const int64_t old_file = FileOf(old_stamp);
  const int64_t file = FileOf(stamp);
  if (old_file != file) {
    if (old_file != 0) {
      Remove(old_file, id);
      MarkOthers(old_file, id, "");
    }
    if (file != 0) database_.Prepare("INSERT INTO files VALUES(?1, ?2)").Bind(1, file).Bind(2, id).Run();
  }
  // Also when it was a suspect, or has the stamp of before: the document of another name may have been made
  // before the file last changed, and been stored since.
  if (file != 0) MarkOthers(file, id, stamp);
}

void FileLinks::OnSeen(int64_t id, const std::string& stamp) {
  database_.Prepare("DELETE FROM suspects WHERE id = ?1").Bind(1, id).Run();
  const int64_t file = FileOf(stamp);
  if (file != 0) MarkOthers(file, id, stamp);
}

void FileLinks::Remove(int64_t file, int64_t id) {
  database_.Prepare("DELETE FROM files WHERE file = ?1 AND id = ?2").Bind(1, file).Bind(2, id).Run();
}

void FileLinks::Forget(int64_t id, const DocRow& row) {
  database_.Prepare("DELETE FROM suspects WHERE id = ?1").Bind(1, id).Run();
  const int64_t file = FileOf(StampOf(&row));
  if (file != 0) Remove(file, id);
}

/// The documents of a file follow each other in the table.
void FileLinks::OnTakenOut(const DocSet& documents) {
  std::vector<int64_t> others;  // of files that documents are of
  std::vector<int64_t> same;    // of the file at hand
  bool any_taken_out = false;   // of these
  int64_t file = 0;
  const auto end_file = [&] {
    if (any_taken_out) others.insert(others.end(), same.begin(), same.end());
    same.clear();
    any_taken_out = false;
  };
  Statement statement = database_.Prepare("SELECT file, id FROM files ORDER BY file, id");
  while (statement.Step()) {
    if (statement.Int(0) != file) end_file();
    file = statement.Int(0);
    const int64_t id = statement.Int(1);
    documents.Contains(id) ? static_cast<void>(any_taken_out = true) : same.push_back(id);
  }
  end_file();
  for (const int64_t other : others) {
    if (!FindDocument(database_, tree_, other).has_value()) continue;
    database_.Prepare("INSERT OR IGNORE INTO suspects VALUES(?1)").Bind(1, other).Run();
  }
}

void FileLinks::MarkOthers(int64_t file, int64_t id, const std::string& stamp) {
  std::vector<int64_t> others;
  {
    Statement statement =
        database_.Prepare("SELECT id FROM files WHERE file = ?1 AND id <> ?2 AND id NOT IN (SELECT id FROM suspects)");
    statement.Bind(1, file).Bind(2, id);
    while (statement.Step()) others.push_back(statement.Int(0));
  }
  for (const int64_t other : others) {
    const std::optional<StoredDocument> stored = FindDocument(database_, tree_, other);
    if (!stored.has_value() || StampOf(&stored->row) == stamp) continue;
    database_.Prepare("INSERT INTO suspects VALUES(?1)").Bind(1, other).Run();
  }
}

}  // namespace ferrox::engine
