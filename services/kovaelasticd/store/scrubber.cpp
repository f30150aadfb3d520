#include "services/kovaelasticd/store/scrubber.h"

#include <syslog.h>

#include <algorithm>

#include "common/clock.h"
#include "common/log.h"
#include "services/kovaelasticd/store/page_checksums.h"

namespace ferrox::engine {

namespace {

using std::chrono::seconds;

/// Between two turns, for whoever else needs the disk.
constexpr std::chrono::milliseconds kPause{20};
/// Until the next attempt when a search keeps the log from being written into the file.
constexpr seconds kWhileInUse{60};
/// The byte range of a file that SQLite uses for locks alone: the page that holds it is never written.
constexpr int64_t kLockByte = 0x40000000;

/// The connection's file as SQLite sees it: its pages are checked as they are read.
sqlite3_file* OpenedFile(Database& database) {
  sqlite3_file* file = nullptr;
  database.Check(sqlite3_file_control(database.Handle(), nullptr, SQLITE_FCNTL_FILE_POINTER, &file));
  return file;
}

}  // namespace

int64_t Scrubber::SteadySec() const { return std::chrono::duration_cast<seconds>(SteadyClock::now() - since_).count(); }

int64_t Scrubber::SecondsUntilDue() const {
  if (!checked_) return kDaySec;
  const int64_t passed = Clock::Get().Now() - last_;
  return kEverySec - (passed >= 0 ? passed : SteadySec());
}

Scrubber::SteadyClock::time_point Scrubber::NextTurn() const {
  const int64_t wait = InPass() || !loaded_ ? 0 : SecondsUntilDue();
  if (wait <= 0) return not_before_;
  return std::max(SteadyClock::now() + seconds(std::min(wait, kDaySec)), not_before_);
}

void Scrubber::Turn() {
  if (SteadyClock::now() < NextTurn()) return;
  try {
    Step();
    if (!InPass()) database_.reset();
  } catch (...) {
    page_ = 0;
    database_.reset();
    not_before_ = SteadyClock::now() + seconds(kDaySec);
    throw;
  }
}

void Scrubber::Step() {
  if (InPass()) return ReadOn();
  if (database_ == nullptr) Open();
  if (!loaded_) LoadLast();
  if (SecondsUntilDue() <= 0) Begin();
}

/// Has SQLite read the schema too, without which the connection knows of no log. A change that was refused may have
/// left the store's transaction open; it would not end while this thread waits for it.
void Scrubber::Open() {
  database_ = std::make_unique<Database>(path_, Database::Mode::kWrite);
  (void)sqlite3_busy_timeout(database_->Handle(), 0);
  (void)database_->QueryInt("SELECT count(*) FROM sqlite_master");
}

void Scrubber::LoadLast() {
  unsigned char header[100] = {};
  sqlite3_file* file = OpenedFile(*database_);
  database_->Check(file->pMethods->xRead(file, header, sizeof(header), 0));
  checked_ = header[20] == kChecksumBytes;
  Statement statement = database_->Prepare("SELECT value FROM info WHERE key = 'scrubbed'");
  const bool noted = statement.Step();
  if (noted) last_ = statement.Int(0);
  loaded_ = true;
  if (checked_ && !noted) NoteNow();
}

void Scrubber::NoteNow() {
  last_ = Clock::Get().Now();
  since_ = SteadyClock::now();
  database_->Prepare("INSERT OR REPLACE INTO info(key, value) VALUES('scrubbed', ?1)").Bind(1, last_).Run();
}

/// Moves all that is in the log into the file first. After a crash the file may hold pages of which only a part was
/// written; they are in the log as well, and whole after that.
void Scrubber::Begin() {
  int in_log = 0;
  int moved = 0;
  const int result =
      sqlite3_wal_checkpoint_v2(database_->Handle(), nullptr, SQLITE_CHECKPOINT_PASSIVE, &in_log, &moved);
  if (result == SQLITE_BUSY || (result == SQLITE_OK && in_log != moved)) {
    not_before_ = SteadyClock::now() + kWhileInUse;
    return;
  }
  database_->Check(result);
  bytes_.resize(static_cast<size_t>(database_->QueryInt("PRAGMA page_size")));
  pages_ = database_->QueryInt("PRAGMA page_count");
  page_ = 1;
}

void Scrubber::ReadOn() {
  const auto size = static_cast<int64_t>(bytes_.size());
  sqlite3_file* file = OpenedFile(*database_);
  for (int64_t left = kTurnBytes; left > 0 && page_ <= pages_; left -= size, ++page_) {
    if (page_ == kLockByte / size + 1) continue;
    const int64_t at = (page_ - 1) * size;
    database_->Check(file->pMethods->xRead(file, bytes_.data(), static_cast<int>(size), at));
  }
  not_before_ = SteadyClock::now() + kPause;
  if (page_ > pages_) End();
}

void Scrubber::End() {
  page_ = 0;
  Log(LOG_INFO, "index file %s: all its %lld pages, %lld bytes, were read and are whole", path_.c_str(),
      static_cast<long long>(pages_), static_cast<long long>(pages_) * static_cast<long long>(bytes_.size()));
  bytes_ = {};
  NoteNow();
}

}  // namespace ferrox::engine
