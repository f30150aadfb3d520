#pragma once

#include <sqlite3.h>

#include <cstdint>
#include <memory>
#include <string>
#include <string_view>
#include <unordered_map>

#include "common/error.h"

namespace ferrox::engine {

/// Of SQLite's failures the one that time does not mend: the file's content is damaged, by a page's checksum or by what
/// it holds, or no database.
class IndexDamaged : public Error {
 public:
  explicit IndexDamaged(const std::string& reason) : Error(Error::kEngineStorage, reason) {}
};

/// The volume of the file is full.
class VolumeFull : public Error {
 public:
  explicit VolumeFull(const std::string& reason) : Error(Error::kEngineStorage, reason) {}
};

class Database;

/// A thin layer over SQLite's C interface: owners for its handles, exceptions for its codes.
///
/// A prepared statement, borrowed from its database's cache while this lives. Parameters count from 1, columns from 0.
/// Texts are bound without a copy: they must outlive the stepping.
class Statement {
 public:
  Statement(Database& database, sqlite3_stmt* statement) : database_(&database), statement_(statement) {}
  Statement(Statement&& other) noexcept : database_(other.database_), statement_(other.statement_) {
    other.statement_ = nullptr;
  }
  Statement(const Statement&) = delete;
  Statement& operator=(const Statement&) = delete;
  ~Statement();

  // Each returns the statement, so that calls are chained. @throws Error kEngineStorage.
  Statement& Bind(int index, int64_t value);
  Statement& Bind(int index, double value) = delete;  // a size or count would lose its last digits unnoticed
  Statement& Bind(int index, std::string_view text);
  Statement& BindBlob(int index, std::string_view bytes);
  Statement& BindNull(int index);
  /// What another statement has in a column of its row.
  Statement& BindColumn(int index, const Statement& row, int column);
  /// Lends an object to a function of ours, which asks for it by `type`.
  Statement& BindPointer(int index, void* object, const char* type);

  /// Goes to the next row; false after the last. @throws Error kEngineStorage.
  bool Step();
  /// Runs a statement that returns no rows, and makes it ready for other parameters.
  void Run();
  /// Makes it ready for other parameters before its rows are all read.
  void Reset();

  // The row at hand, after a Step that returned true.
  int64_t Int(int column) const { return sqlite3_column_int64(statement_, column); }
  bool IsBlob(int column) const { return sqlite3_column_type(statement_, column) == SQLITE_BLOB; }
  bool IsNull(int column) const { return sqlite3_column_type(statement_, column) == SQLITE_NULL; }
  /// Valid until the next step.
  std::string_view Text(int column) const;

 private:
  Database* database_;
  sqlite3_stmt* statement_;
};

/// One connection to one database file, whose pages have checksums when it was made by this class (checksum_vfs.h). For
/// one thread at a time.
class Database {
 public:
  /// kCreate makes a missing file. kRead is opened for writing too, which the write-ahead log needs; its user forbids
  /// changes by PRAGMA query_only.
  enum class Mode { kCreate, kWrite, kRead };
  /// How long a statement waits for another connection's lock.
  static constexpr int kBusyTimeoutMs = 10000;

  /// @throws Error kEngineStorage with the file's name, the cause and the remedy, as every member does.
  Database(const std::string& path, Mode mode);
  Database(const Database&) = delete;
  Database& operator=(const Database&) = delete;
  ~Database();

  /// The statement for `sql`, which must be a literal or live as long as the database; prepared once.
  Statement Prepare(const char* sql);
  /// The same for a text that is built at run time.
  Statement Prepare(const std::string& sql);
  /// Runs statements without parameters, which are not kept.
  void Execute(const char* sql);
  void Execute(const std::string& sql) { Execute(sql.c_str()); }
  /// The first column of the first row; 0 when there is none.
  int64_t QueryInt(const char* sql);

  /// For what has no member here; its results go to Check.
  sqlite3* Handle() { return handle_.get(); }
  const std::string& Path() const { return path_; }
  /// Logs and throws what the last call's result means for the index; IndexDamaged where that is it.
  [[noreturn]] void Fail(int result);
  /// Fails unless the call that returned `result` succeeded.
  void Check(int result) {
    if (result != SQLITE_OK) [[unlikely]]
      Fail(result);
  }
  /// For a call whose other failures may pass: fails when it has met damage.
  void CheckDamage(int result);

 private:
  struct Closer {
    void operator()(sqlite3* handle) const { (void)sqlite3_close_v2(handle); }
  };
  struct Finalizer {
    void operator()(sqlite3_stmt* statement) const { (void)sqlite3_finalize(statement); }
  };

  std::string path_;
  std::unique_ptr<sqlite3, Closer> handle_;
  /// By their text. A text must not be prepared again while its rows are read: it would be the same statement.
  std::unordered_map<std::string, std::unique_ptr<sqlite3_stmt, Finalizer>> statements_;
};

}  // namespace ferrox::engine
