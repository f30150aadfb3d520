#include "services/kovaelasticd/store/sqlite_db.h"

#include <fcntl.h>
#include <sys/stat.h>

#include <string>

#include "common/log.h"
#include "services/kovaelasticd/store/checksum_vfs.h"
#include "services/kovaelasticd/store/page_checksums.h"
#include "services/kovaelasticd/store/work_limit.h"

namespace ferrox::engine {

namespace {

/// A database holds the contents of files that not everybody may read, whatever others may do in its folder; the files
/// that SQLite makes beside it get its mode. Not by a descriptor: closing that would end SQLite's locks on the file.
void CloseToOthers(const std::string& path) {
  for (const char* suffix : {"", "-wal", "-shm"}) {
    const std::string file = path + suffix;
    struct stat status = {};
    if (lstat(file.c_str(), &status) != 0 || !S_ISREG(status.st_mode) || (status.st_mode & 077) == 0) continue;
    (void)fchmodat(AT_FDCWD, file.c_str(), 0600, AT_SYMLINK_NOFOLLOW);
  }
}

/// By the primary code, which is the low byte of an extended one, except for a page whose checksum is wrong.
bool IsDamage(int result) {
  return result == SQLITE_IOERR_DATA || (result & 0xFF) == SQLITE_CORRUPT || (result & 0xFF) == SQLITE_NOTADB;
}

/// What a person can do about it, the end of the error's sentence.
std::string Remedy(int result) {
  if (IsDamage(result)) return "the file is damaged; the index is made anew";
  switch (result & 0xFF) {
    case SQLITE_FULL:
      return "the disk is full; free space and try again";
    case SQLITE_CANTOPEN:
      return "it cannot be opened; check that it is a file, and that its folder exists and belongs to the engine's "
             "user";
    case SQLITE_IOERR:
      return "it cannot be read or written; when that stays so, look at the disk; the system log tells more";
    default:
      return std::string(sqlite3_errstr(result)) + "; the system log tells more";
  }
}

/// Before the first connection. The library's count of its memory, which nobody asks for, has a lock that each
/// allocation of every thread takes: threads that others go before would keep these waiting.
bool ConfigureLibrary() { return sqlite3_config(SQLITE_CONFIG_MEMSTATUS, 0) == SQLITE_OK; }

}  // namespace

Statement::~Statement() {
  if (statement_ == nullptr) return;
  (void)sqlite3_reset(statement_);
  (void)sqlite3_clear_bindings(statement_);
}

Statement& Statement::Bind(int index, int64_t value) {
  database_->Check(sqlite3_bind_int64(statement_, index, value));
  return *this;
}

Statement& Statement::Bind(int index, std::string_view text) {
  const char* data = text.data() != nullptr ? text.data() : "";
  database_->Check(sqlite3_bind_text64(statement_, index, data, text.size(), SQLITE_STATIC, SQLITE_UTF8));
  return *this;
}

Statement& Statement::BindBlob(int index, std::string_view bytes) {
  const char* data = bytes.data() != nullptr ? bytes.data() : "";
  database_->Check(sqlite3_bind_blob64(statement_, index, data, bytes.size(), SQLITE_STATIC));
  return *this;
}

Statement& Statement::BindNull(int index) {
  database_->Check(sqlite3_bind_null(statement_, index));
  return *this;
}

Statement& Statement::BindColumn(int index, const Statement& row, int column) {
  database_->Check(sqlite3_bind_value(statement_, index, sqlite3_column_value(row.statement_, column)));
  return *this;
}

Statement& Statement::BindPointer(int index, void* object, const char* type) {
  database_->Check(sqlite3_bind_pointer(statement_, index, object, type, nullptr));
  return *this;
}

bool Statement::Step() {
  const int result = sqlite3_step(statement_);
  if (result == SQLITE_ROW) return true;
  if (result != SQLITE_DONE) database_->Fail(result);
  return false;
}

void Statement::Run() {
  while (Step()) {
  }
  Reset();
}

void Statement::Reset() { database_->Check(sqlite3_reset(statement_)); }

/// As a blob: SQLite then neither checks nor converts it.
std::string_view Statement::Text(int column) const {
  const void* data = sqlite3_column_blob(statement_, column);
  const int size = sqlite3_column_bytes(statement_, column);
  return data == nullptr ? std::string_view()
                         : std::string_view(static_cast<const char*>(data), static_cast<size_t>(size));
}

Database::Database(const std::string& path, Mode mode) : path_(path) {
  static const bool configured = ConfigureLibrary();
  (void)configured;  // where something else in the process uses the library already, it stays as it is
  int flags = SQLITE_OPEN_NOMUTEX | SQLITE_OPEN_EXRESCODE;
  // Readers write too: the wal-index, and recovery after a crash.
  flags |= mode == Mode::kCreate ? SQLITE_OPEN_READWRITE | SQLITE_OPEN_CREATE : SQLITE_OPEN_READWRITE;
  sqlite3* opened = nullptr;
  const int result = sqlite3_open_v2(path.c_str(), &opened, flags, ChecksumVfs());
  handle_.reset(opened);
  Check(result);
  if (mode != Mode::kRead) CloseToOthers(path);
  int reserved = kChecksumBytes;  // a file that has its first table already keeps what it has
  Check(sqlite3_file_control(opened, nullptr, SQLITE_FCNTL_RESERVE_BYTES, &reserved));
  (void)sqlite3_busy_timeout(opened, kBusyTimeoutMs);
}

Database::~Database() = default;

Statement Database::Prepare(const char* sql) { return Prepare(std::string(sql)); }

Statement Database::Prepare(const std::string& sql) {
  auto& slot = statements_[sql];
  if (slot == nullptr) {
    sqlite3_stmt* prepared = nullptr;
    const int result = sqlite3_prepare_v3(handle_.get(), sql.c_str(), static_cast<int>(sql.size() + 1),
                                          SQLITE_PREPARE_PERSISTENT, &prepared, nullptr);
    if (result != SQLITE_OK) Fail(result);
    slot.reset(prepared);
  }
  return Statement(*this, slot.get());
}

void Database::Execute(const char* sql) { Check(sqlite3_exec(handle_.get(), sql, nullptr, nullptr, nullptr)); }

int64_t Database::QueryInt(const char* sql) {
  Statement statement = Prepare(sql);
  return statement.Step() ? statement.Int(0) : 0;
}

void Database::CheckDamage(int result) {
  if (IsDamage(result)) Fail(result);
}

void Database::Fail(int result) {
  if ((result & 0xFF) == SQLITE_INTERRUPT) WorkLimit::Fail();
  const char* detail = handle_ != nullptr ? sqlite3_errmsg(handle_.get()) : "";
  const std::string reason = "index file " + path_ + ": " + Remedy(result);
  const FailSite site = {__FILE__, __LINE__, __func__, detail};
  if ((result & 0xFF) == SQLITE_FULL) {
    LogFailure(site, 0, reason);
    throw VolumeFull(reason);
  }
  if (!IsDamage(result)) ::ferrox::Fail(site, 0, Error::kEngineStorage, reason);
  LogFailure(site, 0, reason);
  throw IndexDamaged(reason);
}

}  // namespace ferrox::engine
