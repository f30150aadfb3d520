#pragma once

#include <chrono>
#include <cstdint>
#include <memory>
#include <string>
#include <vector>

#include "common/clock.h"
#include "services/kovaelasticd/store/sqlite_db.h"

namespace ferrox::engine {

/// Reads the whole file of an open index once a week, so that damage is found where no request reads, too, and while
/// the shares that the index is made from are still at hand. It goes through the file in turns of kTurnBytes, for whose
/// time its caller decides; a page that is damaged is found by its checksum. A file without checksums is not read.
///
/// When the last pass ended is noted in the file, as "scrubbed" in the table "info"; in a new file, when it was first
/// opened. The host's clock may be wrong: while the noted time lies in the future, a week is counted from when the
/// index was opened or last read.
///
/// For one thread at a time: the one that writes to the index, while it has no transaction open. Then nobody else
/// writes to the file, since only writers do checkpoints.
class Scrubber {
 public:
  using SteadyClock = std::chrono::steady_clock;
  static constexpr int64_t kEverySec = 7 * kDaySec;
  static constexpr int64_t kTurnBytes = 1 << 20;

  /// `path` is the file of an index that somebody else keeps open.
  explicit Scrubber(std::string path) : path_(std::move(path)) {}

  /// When to call Turn, at the latest a day from now: a change of the host's clock is noticed by then. Asks for nothing
  /// but the time.
  SteadyClock::time_point NextTurn() const;
  /// Does what is due, if anything is: begins a pass, reads on, or ends it. Reads from the disk, and writes what the
  /// write-ahead log holds into the file when it begins.
  /// @throws IndexDamaged, as the file or its log is; Error kEngineStorage when something cannot be read or written.
  /// The pass has ended then, and the next one begins a day later.
  void Turn();
  /// Whether a pass has begun and not ended.
  bool InPass() const { return page_ != 0; }

 private:
  /// How long the index has been open, or not been read.
  int64_t SteadySec() const;
  int64_t SecondsUntilDue() const;
  void Step();
  void Open();
  void LoadLast();
  void NoteNow();
  void Begin();
  void ReadOn();
  void End();

  const std::string path_;
  std::unique_ptr<Database> database_;                  ///< while a pass goes on
  bool loaded_ = false;                                 ///< the next two are known
  bool checked_ = false;                                ///< the file has checksums
  int64_t last_ = 0;                                    ///< when the last pass ended, in seconds since the epoch
  SteadyClock::time_point since_ = SteadyClock::now();  ///< when the index was opened, or the last pass ended
  SteadyClock::time_point not_before_ = since_;         ///< for the next turn
  int64_t page_ = 0;                                    ///< the page to be read next, from 1; 0 outside of a pass
  int64_t pages_ = 0;                                   ///< how many there were when the pass began
  std::vector<char> bytes_;                             ///< of one page, during a pass
};

}  // namespace ferrox::engine
