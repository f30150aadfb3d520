#pragma once

#include <sqlite3.h>

namespace ferrox::engine {

/// The name, for sqlite3_open_v2, of a layer between SQLite and the system's files ("VFS") that keeps the checksums of
/// page_checksums.h. Registered at the first call; SQLite's default stays what it is.
///
/// A database file is checked when its header says that its pages have kChecksumBytes reserved bytes, which a file gets
/// that was made after SQLITE_FCNTL_RESERVE_BYTES. A page gets its checksum when it is written into the database file,
/// which in write-ahead mode is at a checkpoint, and is checked each time it is read from there. A page that is read
/// from the write-ahead log is checked by the checksum of its frame. Where a check fails, the log names file and page
/// and SQLite gets SQLITE_IOERR_DATA, which ends the statement. All other files, and databases without reserved bytes,
/// are passed through.
///
/// Two things are out of its reach: an earlier content of the same page that is whole, as of a write that the disk
/// confirmed and forgot; and a log that SQLite recovers after a crash, which SQLite checks itself and uses up to the
/// first frame that is not whole.
const char* ChecksumVfs();

/// For a connection that only reads: has reads of its file end with SQLITE_INTERRUPT once the calling thread's
/// WorkLimit is over. FTS5 merges all words with one beginning in one step of SQLite's machine, and reads their pages
/// meanwhile.
void ObeyWorkLimit(sqlite3* connection, bool whether);

}  // namespace ferrox::engine
