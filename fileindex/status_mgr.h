#pragma once

#include <string>

#include <json/value.h>

#include "common/export.h"

namespace ferrox::fileindex {

/// The pause deadline and the status bits of the shares, kept in the status file (docs/formats/status.md). Made per
/// use: it reads the file when made, and every change writes the whole document under the status lock. Two processes
/// that change at the same moment may lose one change, so keep an object's life short.
class FERROX_EXPORT StatusMgr {
 public:
  /// Status bits of a share. kNeedReindex: the index may lack changes, because an event could not be queued or the
  /// volume was full; the index daemon compares the share as a whole and then takes the bit away. kSecondCondition: the
  /// index itself must be made anew, which FolderReindex does.
  enum ShareStatus : int { kNeedReindex = 1, kSecondCondition = 2 };

  /// Loads the file; a missing one counts as empty. @throws Error kLoadFailed "Cannot load json: <path>".
  StatusMgr();

  /// Seconds since the epoch at which the pause ends; 0 for a pause without end, -1 for none.
  long long GetPauseInfo() const;
  /// The share's bits, 0 when it has none.
  int GetShareStatus(const std::string& share) const;

  /// Each change below takes the status lock (at most about 58 s) and saves.
  /// @throws Error kLockFailed; kSaveFailed; kInternal when the file's mode cannot be set; kCredentialsFailed.
  /// The first two set and take away the given bits and leave the share's others; the last drops all the share's bits.
  void SetShareStatus(const std::string& share, int bits);
  void UnsetShareStatus(const std::string& share, int bits);
  void ClearShareStatus(const std::string& share);

  /// Pauses indexing for `hours`, without end when 0, and has the index daemon pause; a daemon that is not reached
  /// (kInternal) leaves the pause recorded. @throws Error kBadArgument when `hours` is negative, with nothing changed.
  void Pause(int hours);
  /// Ends a pause and tells the index daemon, as above.
  void Resume();

  /// Writes the document as "root" and makes it world-readable. @throws Error kSaveFailed, kInternal.
  void Save();

 private:
  Json::Value data_;  ///< the whole document; members that other programs put there are kept
};

}  // namespace ferrox::fileindex
