#include "services/kovaelasticd/store/upgrade.h"

#include <sys/statvfs.h>
#include <syslog.h>

#include <algorithm>
#include <cerrno>
#include <cstdio>
#include <vector>

#include "base/path.h"
#include "base/scope_exit.h"
#include "common/file_util.h"
#include "common/log.h"
#include "services/kovaelasticd/store/document.h"
#include "services/kovaelasticd/store/file_links.h"
#include "services/kovaelasticd/store/folder_tree.h"
#include "services/kovaelasticd/store/fts.h"
#include "services/kovaelasticd/store/index_files.h"
#include "services/kovaelasticd/store/place_writer.h"
#include "services/kovaelasticd/store/sqlite_db.h"
#include "services/kovaelasticd/store/sqlite_words.h"
#include "services/kovaelasticd/store/store_format.h"
#include "services/kovaelasticd/store/store_rows.h"
#include "services/kovaelasticd/store/store_stat.h"
#include "services/kovaelasticd/store/text_codec.h"
#include "services/kovaelasticd/text/language.h"
#include "services/kovaelasticd/text/title.h"

namespace ferrox::engine {

namespace {

/// What a row counts for besides its packed bytes.
constexpr int64_t kRowOverhead = 100;

/// Where the system does not say, writing shows it.
bool HasSpaceFor(const std::string& path, int64_t bytes) {
  struct statvfs volume = {};
  if (statvfs(path.c_str(), &volume) != 0) return true;
  return uint64_t{volume.f_bavail} * volume.f_frsize >= static_cast<uint64_t>(bytes);
}

/// One upgrade. The new file is written without a journal, since it is thrown away when that fails, and synced at each
/// commit, so that the disk is kept busy evenly. The old one is attached to its connection as "old".
class Upgrader {
 public:
  Upgrader(const std::string& path, std::shared_ptr<const Schema> schema, const UpgradeOptions& options)
      : schema_(std::move(schema)), options_(options), to_(UpgradeFile(path), Database::Mode::kCreate) {
    to_.Execute("PRAGMA page_size = 8192");
    to_.Execute("PRAGMA cache_size = -8192");  // below 0: KiB
    to_.Execute("PRAGMA journal_mode = OFF");
    to_.Execute("PRAGMA synchronous = FULL");
    if (options.pages_max != 0)
      (void)to_.QueryInt(("PRAGMA max_page_count = " + std::to_string(options.pages_max)).c_str());
    RegisterFullText(to_);
    to_.Execute("BEGIN");
    MakeStoreTables(to_);
    to_.Execute("COMMIT");
    FileLinks(to_, tree_, names_).MakeTables();
    to_.Prepare("ATTACH ?1 AS old").Bind(1, std::string_view(path)).Run();
    format_ = to_.QueryInt("PRAGMA old.user_version");
    of_ = to_.QueryInt("SELECT value FROM old.info WHERE key = 'documents'");
    bytes_of_ = std::max<int64_t>(1, to_.QueryInt("PRAGMA old.page_count") * to_.QueryInt("PRAGMA old.page_size"));
  }

  void Run() {
    options_.on_turn(0, of_);
    const bool has_tree = format_ >= kTreeFormat;
    const bool cut_words = format_ < kWordsFormat;
    to_.Execute("BEGIN");
    if (!has_tree) PlaceDocuments();
    CopyTables([&](const std::string& table) {
      const bool is_tree = table == "docs" || table == "folders";
      const bool is_words = table == "bodies" || table.starts_with("content_fts") || table.starts_with("meta_fts");
      return (has_tree || !is_tree) && (!cut_words || !is_words);
    });
    to_.Execute("DELETE FROM main.info WHERE key = 'scrubbed'");  // the new file's checksums are new, too
    if (cut_words) CutWords();
    MakeStoreIndexes(to_);
    to_.Execute("COMMIT");
    PlaceWriter(to_).MakeTable();
  }

 private:
  /// Gives the documents of format 2, whose rows have whole paths, their places in the tree of folders.
  void PlaceDocuments() {
    Statement documents = to_.Prepare(
        "SELECT path, id, name, ext, kind, size, mtime, text_bytes, derived, error, packed FROM old.docs ORDER BY id");
    Statement copy = to_.Prepare(
        "INSERT INTO main.docs(folder, leaf, id, name, ext, kind, size, mtime, text_bytes, derived, error, packed)"
        " VALUES(?1, ?2, ?3, ?4, ?5, ?6, ?7, ?8, ?9, ?10, ?11, ?12)");
    constexpr int kColumns = 11;
    while (documents.Step()) {
      const std::string path(documents.Text(0));
      copy.Bind(1, tree_.Make(FolderTree::FolderOf(path))).Bind(2, FolderTree::LeafOf(path));
      for (int column = 1; column < kColumns; ++column) copy.BindColumn(column + 2, documents, column);
      copy.Run();
      Count(static_cast<int64_t>(documents.Text(kColumns - 1).size()));
    }
  }

  /// Takes over, byte by byte, the tables that both files have, and of them the columns that both have. The tables
  /// that a full-text table is made of are among them.
  template <typename Wanted>
  void CopyTables(Wanted wanted) {
    std::vector<std::string> tables;
    Statement names = to_.Prepare(
        "SELECT name FROM main.sqlite_master WHERE type = 'table' AND rootpage > 0 AND name IN"
        " (SELECT name FROM old.sqlite_master)");
    while (names.Step()) tables.emplace_back(names.Text(0));
    for (const std::string& table : tables) {
      if (wanted(table)) CopyTable(table);
    }
  }

  void CopyTable(const std::string& table) {
    Statement columns = to_.Prepare(
        "SELECT name FROM pragma_table_info(?1, 'main') INTERSECT SELECT name FROM pragma_table_info(?1, 'old')");
    std::string list, values;
    int count = 0;
    for (columns.Bind(1, std::string_view(table)); columns.Step(); ++count) {
      list += (count == 0 ? "" : ", ") + std::string(columns.Text(0));
      values += (count == 0 ? "?" : ", ?") + std::to_string(count + 1);
    }
    to_.Execute("DELETE FROM main." + table);
    Statement rows = to_.Prepare("SELECT " + list + " FROM old." + table);
    Statement copy = to_.Prepare("INSERT INTO main." + table + "(" + list + ") VALUES(" + values + ")");
    while (rows.Step()) {
      int64_t bytes = 0;
      for (int column = 0; column < count; ++column) {
        copy.BindColumn(column + 1, rows, column);
        if (rows.IsBlob(column)) bytes += static_cast<int64_t>(rows.Text(column).size());
      }
      copy.Run();
      Count(bytes);
    }
  }

  /// Makes the words of all documents, and what else follows from their texts, as if each were new.
  void CutWords() {
    LoadFieldNames(to_, names_);
    tree_.Forget();
    done_ = 0;
    counts_documents_ = true;
    SqliteWords words(to_, names_, schema_);
    TextCodec codec;
    static const std::string rows_sql = std::string(kSelectRow) + "ORDER BY id";
    Statement rows = to_.Prepare(rows_sql);
    Statement body = to_.Prepare("SELECT zstd FROM old.bodies WHERE id = ?1");
    Statement learned = to_.Prepare("UPDATE main.docs SET language = ?2, title = ?3 WHERE id = ?1");
    while (rows.Step()) {
      StoredDocument stored = ReadRow(rows, tree_.PathOf(rows.Int(1)));
      std::string text;
      if (stored.text_bytes > 0 && body.Bind(1, stored.id).Step()) text = codec.Unpack(body.Text(0));
      body.Reset();
      if (static_cast<int64_t>(text.size()) != stored.text_bytes) to_.Fail(SQLITE_CORRUPT);
      const Json::Value document = UnpackDocument(stored.row, names_, {});
      stored.row.language = LanguageOf(document, text);
      stored.row.title = TitleOf(text, stored.row.ext);
      learned.Bind(1, stored.id).Bind(2, static_cast<int64_t>(stored.row.language));
      learned.Bind(3, std::string_view(stored.row.title)).Run();
      words.Add(stored.id, MakeMetaText(stored.row, document, *schema_), text);
      words.Changed(stored.text_bytes);
      ++done_;
      Count(stored.text_bytes);
    }
    words.Flush();
  }

  /// To be called after each row; ends a turn where it is long enough.
  void Count(int64_t bytes) {
    bytes_ += bytes + kRowOverhead;
    turn_bytes_ += bytes + kRowOverhead;
    if (turn_bytes_ < options_.turn_bytes) return;
    turn_bytes_ = 0;
    to_.Execute("COMMIT");
    if (!counts_documents_) done_ = static_cast<int64_t>(static_cast<double>(of_) * std::min(1.0, Part()));
    options_.on_turn(std::min(done_, of_), of_);
    to_.Execute("BEGIN");
  }
  double Part() const { return static_cast<double>(bytes_) / static_cast<double>(bytes_of_); }

  const std::shared_ptr<const Schema> schema_;
  const UpgradeOptions& options_;
  Database to_;
  FieldNames names_;
  FolderTree tree_{to_};
  int64_t format_ = 0;             ///< of the old file
  int64_t of_ = 0;                 ///< its documents
  int64_t done_ = 0;               ///< of these
  bool counts_documents_ = false;  ///< they are counted one by one, not by the part of the file that was read
  int64_t bytes_ = 0;              ///< read so far
  int64_t bytes_of_ = 0;           ///< the old file's size
  int64_t turn_bytes_ = 0;         ///< read in this turn
};

}  // namespace

void WriteUpgraded(const std::string& path, std::shared_ptr<const Schema> schema, const UpgradeOptions& options) {
  RemoveUpgradeFile(path);
  bool complete = false;
  const base::ScopeExit remove([&] {
    if (!complete) RemoveUpgradeFile(path);
  });
  const int64_t old_bytes = BytesOnDisk(path) + BytesOnDisk(path + "-wal");
  const int64_t needed = old_bytes + old_bytes / 16;  // checksums, and what the old format lacks
  try {
    if (!HasSpaceFor(path, needed)) throw VolumeFull("the volume is full");
    Upgrader(path, std::move(schema), options).Run();
  } catch (const VolumeFull&) {
    Fail({FERROX_SOURCE, __LINE__, __func__, "too little space"}, 0, Error::kEngineStorage,
         "the index in " + base::FolderOf(path) + " cannot be upgraded: that takes " +
             std::to_string((needed >> 20) + 1) +
             " MiB beside it, which its volume does not have; free space, and it is tried again within an hour, or "
             "'fileindexctl rebuild' makes the index anew");
  }
  complete = true;
}

/// What the old file's log still holds is moved into it first, and the log removed: it must not be taken for that of
/// the new file, and a kill in between leaves the old file whole.
void ReplaceByUpgraded(const std::string& path) {
  {
    Database old(path, Database::Mode::kWrite);
    FERROX_FAIL_IF(old.QueryInt("PRAGMA wal_checkpoint(TRUNCATE)") != 0, Error::kEngineStorage,
                   "index file " + path + ": it is in use, and cannot be replaced by the upgraded one");
  }
  for (const char* suffix : {"-wal", "-shm"}) {
    FERROX_FAIL_IF(!Unlink(path + suffix), Error::kEngineStorage,
                   "cannot remove " + path + suffix + ": " + ErrnoText());
  }
  FERROX_FAIL_IF(rename(UpgradeFile(path).c_str(), path.c_str()) != 0, Error::kEngineStorage,
                 "cannot replace " + path + " by the upgraded file: " + ErrnoText());
  SyncIndexFolder(base::FolderOf(path));
  Log(LOG_NOTICE, "index file %s: it has format %d now", path.c_str(), static_cast<int>(kStoreFormat));
}

}  // namespace ferrox::engine
