#include "services/kovaelasticd/store/checksum_vfs.h"

#include <sqlite3.h>
#include <syslog.h>

#include <algorithm>
#include <cstring>
#include <limits>
#include <memory>
#include <new>
#include <type_traits>

#include "common/log.h"
#include "services/kovaelasticd/store/page_checksums.h"
#include "services/kovaelasticd/store/work_limit.h"

namespace ferrox::engine {

namespace {

constexpr int kLimitReads = 0x4B4F5641;  ///< of a file: SQLite's own operations are below 100
constexpr int kFileHeaderBytes = 100;
constexpr int kReservedAt = 20;  ///< the place in the file's header that tells how many bytes of a page are reserved

/// A file as SQLite sees it. SQLite provides the memory and never looks behind sqlite3_file; the file of the VFS
/// beneath lies in the same memory, behind ours.
struct LayerFile : sqlite3_file {
  sqlite3_file* beneath = nullptr;
  const char* name = nullptr;  ///< SQLite keeps it while the file is open

  int Read(void* bytes, int amount, sqlite3_int64 offset) const {
    return beneath->pMethods->xRead(beneath, bytes, amount, offset);
  }
  int Write(const void* bytes, int amount, sqlite3_int64 offset) const {
    return beneath->pMethods->xWrite(beneath, bytes, amount, offset);
  }
};

/// A database file. Like its connection, for one thread at a time.
struct CheckedFile : LayerFile {
  int page_size = 0;     ///< 0: not known, since the file has no header yet
  bool checked = false;  ///< the pages have checksums
  bool limited = false;  ///< ObeyWorkLimit
  std::unique_ptr<uint8_t[]> scratch;

  /// Takes from the file's first bytes what they tell. Anything but a header changes nothing.
  void Learn(const uint8_t* header) {
    if (memcmp(header, "SQLite format 3", 16) != 0) return;
    const int stored = header[16] << 8 | header[17];
    const int size = stored == 1 ? 65536 : stored;
    if (size < 512 || (size & (size - 1)) != 0) return;
    if (size != page_size) scratch.reset();
    page_size = size;
    checked = header[kReservedAt] != 0;
  }
  void LearnFromFile() {
    uint8_t header[kFileHeaderBytes] = {};
    if (page_size == 0 && Read(header, kFileHeaderBytes, 0) == SQLITE_OK) Learn(header);
  }
  bool IsPage(int amount, sqlite3_int64 offset) const {
    return amount > 0 && amount == page_size && offset % amount == 0;
  }
  uint32_t NumberAt(sqlite3_int64 offset) const { return static_cast<uint32_t>(offset / page_size) + 1; }
  /// A copy of the page that may be changed; null when there is no memory for it.
  uint8_t* Copy(const void* page) {
    if (scratch == nullptr) scratch.reset(new (std::nothrow) uint8_t[static_cast<size_t>(page_size)]);
    if (scratch != nullptr) memcpy(scratch.get(), page, static_cast<size_t>(page_size));
    return scratch.get();
  }
  /// Whether the first page of a file that says that it has no checksums has one all the same: then it is that byte
  /// which is damaged.
  bool HasLostItsMark(const uint8_t* page) {
    uint8_t* marked = Copy(page);
    if (marked == nullptr) return false;
    marked[kReservedAt] = kChecksumBytes;
    return IsPageWhole(marked, static_cast<size_t>(page_size), 1);
  }
};

/// A write-ahead log: a header, then frames of a header and a page each.
///
/// Within one transaction SQLite may write a page a second time into the frame that it has, and mends the frame's
/// checksum, and those of all behind it, only at the commit. Until then only the connection itself reads these frames,
/// and they cannot be checked.
struct CheckedLog : LayerFile {
  static constexpr sqlite3_int64 kNone = std::numeric_limits<sqlite3_int64>::max();

  const CheckedFile* database = nullptr;
  sqlite3_int64 last_header_at = kNone;  ///< of the frame header that was written last
  sqlite3_int64 stale_from = kNone;      ///< the first frame whose checksum is not that of its page

  bool IsPage(int amount, sqlite3_int64 offset) const {
    const sqlite3_int64 in_first = offset - kLogHeaderBytes - kFrameHeaderBytes;
    return database->checked && amount == database->page_size && in_first >= 0 &&
           in_first % (kFrameHeaderBytes + amount) == 0;
  }
  /// Where the checksum is from which the frame at `frame_at` goes on.
  sqlite3_int64 SumBefore(sqlite3_int64 frame_at) const {
    if (frame_at == kLogHeaderBytes) return kLogHeaderSumAt;
    return frame_at - kFrameHeaderBytes - database->page_size + kFrameHeaderSumAt;
  }
  /// Notes what a write means for stale_from. A header that is written mends the chain from there on: it is written
  /// either before its page, or by the commit, which goes through all stale frames.
  void NoteWrite(int amount, sqlite3_int64 offset) {
    if (amount == kFrameHeaderBytes) {
      last_header_at = offset;
      if (offset <= stale_from) stale_from = kNone;
    } else if (IsPage(amount, offset) && offset - kFrameHeaderBytes != last_header_at) {
      stale_from = std::min(stale_from, offset - kFrameHeaderBytes);
    }
  }
};

int ReportDamage(const LayerFile& file, const char* what, sqlite3_int64 number) {
  Log(LOG_ERR, "index file %s: the checksum of %s %lld is wrong", file.name, what, static_cast<long long>(number));
  return SQLITE_IOERR_DATA;
}

/// Reads from a database file. A page behind the file's end, which SQLite takes for zeros, is a cut file's: SQLite asks
/// for none that was not written.
int ReadDatabase(sqlite3_file* opened, void* bytes, int amount, sqlite3_int64 offset) {
  auto& file = *static_cast<CheckedFile*>(opened);
  if (file.limited && WorkLimit::IsOver()) return SQLITE_INTERRUPT;
  const int result = file.Read(bytes, amount, offset);
  if (result != SQLITE_OK && result != SQLITE_IOERR_SHORT_READ) return result;
  const auto* page = static_cast<const uint8_t*>(bytes);
  offset == 0 && amount >= kFileHeaderBytes ? file.Learn(page) : file.LearnFromFile();
  if (!file.IsPage(amount, offset)) return result;
  const uint32_t number = file.NumberAt(offset);
  const bool damaged =
      file.checked ? !IsPageWhole(page, static_cast<size_t>(amount), number) : number == 1 && file.HasLostItsMark(page);
  return damaged ? ReportDamage(file, "page", number) : result;
}

int ControlDatabase(sqlite3_file* opened, int operation, void* argument) {
  auto& file = *static_cast<CheckedFile*>(opened);
  if (operation != kLimitReads) return file.beneath->pMethods->xFileControl(file.beneath, operation, argument);
  file.limited = *static_cast<const bool*>(argument);
  return SQLITE_OK;
}

int WriteDatabase(sqlite3_file* opened, const void* bytes, int amount, sqlite3_int64 offset) {
  auto& file = *static_cast<CheckedFile*>(opened);
  const auto* content = static_cast<const uint8_t*>(bytes);
  offset == 0 && amount >= kFileHeaderBytes ? file.Learn(content) : file.LearnFromFile();
  if (!file.checked || !file.IsPage(amount, offset)) return file.Write(bytes, amount, offset);
  uint8_t* page = file.Copy(bytes);
  if (page == nullptr) return SQLITE_IOERR_NOMEM;
  SealPage(page, static_cast<size_t>(amount), file.NumberAt(offset));
  return file.Write(page, amount, offset);
}

int ReadLog(sqlite3_file* opened, void* bytes, int amount, sqlite3_int64 offset) {
  auto& log = *static_cast<CheckedLog*>(opened);
  const int result = log.Read(bytes, amount, offset);
  const sqlite3_int64 frame_at = offset - kFrameHeaderBytes;
  if (result != SQLITE_OK || !log.IsPage(amount, offset) || frame_at >= log.stale_from) return result;
  uint8_t header[kFrameHeaderBytes];
  uint8_t sum_before[8];
  int failed = log.Read(header, sizeof(header), frame_at);
  if (failed == SQLITE_OK) failed = log.Read(sum_before, sizeof(sum_before), log.SumBefore(frame_at));
  if (failed != SQLITE_OK) return failed;
  if (IsFrameWhole(header, static_cast<const uint8_t*>(bytes), static_cast<size_t>(amount), sum_before)) return result;
  return ReportDamage(log, "frame", frame_at / (kFrameHeaderBytes + amount) + 1);
}

int WriteLog(sqlite3_file* opened, const void* bytes, int amount, sqlite3_int64 offset) {
  auto& log = *static_cast<CheckedLog*>(opened);
  log.NoteWrite(amount, offset);
  return log.Write(bytes, amount, offset);
}

template <typename File>
int CloseLayer(sqlite3_file* opened) {
  auto* file = static_cast<File*>(opened);
  const int result = file->beneath->pMethods->xClose(file->beneath);
  file->~File();
  return result;
}

/// The methods that do nothing but pass on: PassFile<&sqlite3_io_methods::xSync>::Call, and likewise of the VFS.
template <auto kMethod>
struct PassFile;
template <typename Result, typename... Args, Result (*sqlite3_io_methods::*kMethod)(sqlite3_file*, Args...)>
struct PassFile<kMethod> {
  static Result Call(sqlite3_file* file, Args... args) {
    sqlite3_file* beneath = static_cast<LayerFile*>(file)->beneath;
    return (beneath->pMethods->*kMethod)(beneath, args...);
  }
};
template <auto kMethod>
struct PassVfs;
template <typename Result, typename... Args, Result (*sqlite3_vfs::*kMethod)(sqlite3_vfs*, Args...)>
struct PassVfs<kMethod> {
  static Result Call(sqlite3_vfs* vfs, Args... args) {
    auto* beneath = static_cast<sqlite3_vfs*>(vfs->pAppData);
    return (beneath->*kMethod)(beneath, args...);
  }
};

/// Version 2, which has no xFetch: SQLite then maps no page into memory, past the checks.
template <typename File>
const sqlite3_io_methods& MethodsOf(int (*read)(sqlite3_file*, void*, int, sqlite3_int64),
                                    int (*write)(sqlite3_file*, const void*, int, sqlite3_int64)) {
  using M = sqlite3_io_methods;
  static const M kMethods = [&] {
    M methods = {};
    methods.iVersion = 2;
    methods.xClose = &CloseLayer<File>;
    methods.xRead = read;
    methods.xWrite = write;
    methods.xTruncate = &PassFile<&M::xTruncate>::Call;
    methods.xSync = &PassFile<&M::xSync>::Call;
    methods.xFileSize = &PassFile<&M::xFileSize>::Call;
    methods.xLock = &PassFile<&M::xLock>::Call;
    methods.xUnlock = &PassFile<&M::xUnlock>::Call;
    methods.xCheckReservedLock = &PassFile<&M::xCheckReservedLock>::Call;
    methods.xFileControl = std::is_same_v<File, CheckedFile> ? &ControlDatabase : &PassFile<&M::xFileControl>::Call;
    methods.xSectorSize = &PassFile<&M::xSectorSize>::Call;
    methods.xDeviceCharacteristics = &PassFile<&M::xDeviceCharacteristics>::Call;
    methods.xShmMap = &PassFile<&M::xShmMap>::Call;
    methods.xShmLock = &PassFile<&M::xShmLock>::Call;
    methods.xShmBarrier = &PassFile<&M::xShmBarrier>::Call;
    methods.xShmUnmap = &PassFile<&M::xShmUnmap>::Call;
    return methods;
  }();
  return kMethods;
}

/// Where the file of the VFS beneath begins, in bytes from ours.
constexpr int kLayerBytes = static_cast<int>((std::max(sizeof(CheckedFile), sizeof(CheckedLog)) + 7) / 8 * 8);

/// Opens the file beneath and makes ours. @return null, with `result` set, when the first fails.
template <typename File>
File* OpenLayer(sqlite3_vfs* beneath, const char* name, sqlite3_file* opened, int flags, int* out_flags, int& result) {
  auto* below = reinterpret_cast<sqlite3_file*>(reinterpret_cast<char*>(opened) + kLayerBytes);
  opened->pMethods = nullptr;  // nothing that SQLite would have to close
  below->pMethods = nullptr;
  result = beneath->xOpen(beneath, name, below, flags, out_flags);
  if (result != SQLITE_OK) {
    if (below->pMethods != nullptr) (void)below->pMethods->xClose(below);
    return nullptr;
  }
  auto* file = new (opened) File();
  file->beneath = below;
  file->name = name;
  return file;
}

int OpenInLayer(sqlite3_vfs* vfs, const char* name, sqlite3_file* opened, int flags, int* out_flags) {
  auto* beneath = static_cast<sqlite3_vfs*>(vfs->pAppData);
  int result = SQLITE_OK;
  if ((flags & SQLITE_OPEN_MAIN_DB) != 0) {
    auto* file = OpenLayer<CheckedFile>(beneath, name, opened, flags, out_flags, result);
    if (file != nullptr) file->pMethods = &MethodsOf<CheckedFile>(ReadDatabase, WriteDatabase);
    return result;
  }
  if ((flags & SQLITE_OPEN_WAL) != 0) {
    auto* log = OpenLayer<CheckedLog>(beneath, name, opened, flags, out_flags, result);
    if (log == nullptr) return result;
    log->database = static_cast<const CheckedFile*>(sqlite3_database_file_object(name));
    log->pMethods = &MethodsOf<CheckedLog>(ReadLog, WriteLog);
    return result;
  }
  return beneath->xOpen(beneath, name, opened, flags, out_flags);
}

sqlite3_vfs MakeLayer(sqlite3_vfs* beneath) {
  using V = sqlite3_vfs;
  V vfs = {};
  vfs.iVersion = std::min(beneath->iVersion, 3);
  vfs.szOsFile = kLayerBytes + beneath->szOsFile;
  vfs.mxPathname = beneath->mxPathname;
  vfs.zName = "kova_checksums";
  vfs.pAppData = beneath;
  vfs.xOpen = &OpenInLayer;
  vfs.xDelete = &PassVfs<&V::xDelete>::Call;
  vfs.xAccess = &PassVfs<&V::xAccess>::Call;
  vfs.xFullPathname = &PassVfs<&V::xFullPathname>::Call;
  vfs.xDlOpen = &PassVfs<&V::xDlOpen>::Call;
  vfs.xDlError = &PassVfs<&V::xDlError>::Call;
  vfs.xDlSym = &PassVfs<&V::xDlSym>::Call;
  vfs.xDlClose = &PassVfs<&V::xDlClose>::Call;
  vfs.xRandomness = &PassVfs<&V::xRandomness>::Call;
  vfs.xSleep = &PassVfs<&V::xSleep>::Call;
  vfs.xCurrentTime = &PassVfs<&V::xCurrentTime>::Call;
  vfs.xGetLastError = &PassVfs<&V::xGetLastError>::Call;
  vfs.xCurrentTimeInt64 = &PassVfs<&V::xCurrentTimeInt64>::Call;
  vfs.xSetSystemCall = &PassVfs<&V::xSetSystemCall>::Call;
  vfs.xGetSystemCall = &PassVfs<&V::xGetSystemCall>::Call;
  vfs.xNextSystemCall = &PassVfs<&V::xNextSystemCall>::Call;
  return vfs;
}

}  // namespace

void ObeyWorkLimit(sqlite3* connection, bool whether) {
  (void)sqlite3_file_control(connection, "main", kLimitReads, &whether);
}

const char* ChecksumVfs() {
  static sqlite3_vfs vfs = MakeLayer(sqlite3_vfs_find(nullptr));
  static const int kRegistered = sqlite3_vfs_register(&vfs, 0);
  (void)kRegistered;  // where that failed, opening says that there is no such VFS
  return vfs.zName;
}

}  // namespace ferrox::engine
