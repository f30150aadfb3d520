#pragma once

#include "common/error.h"
#include "services/fileindexd/share_context.h"

namespace ferrox::indexd {

/// Whether a share can be worked on now: it exists at its folder, its volume is mounted, and there is space for its
/// index. Remembers that the volume was away or full until that is over. Belongs to the worker's thread.
class ShareAvailability {
 public:
  explicit ShareAvailability(ShareContext& context) : context_(context) {}

  /// @throws Error: kNoSuchShare when the share is gone or lies elsewhere; kSpaceNotEnough while a full disk has not
  /// got space again; kPathNotIndexable, with a sentence, for any other reason; kInternal.
  void Check();

  /// Whether a Check since ClearAway did not find the share's folder or volume. What happened there meanwhile was not
  /// noticed.
  bool WasAway() const { return was_away_; }
  void ClearAway() { was_away_ = false; }

  /// Whether the failure of a round means that the disk is full.
  bool IsOutOfSpace(const Error& error) const;
  /// Logs and notifies once for each time that the disk gets full, and marks the share as needing a reindex, so that
  /// whatever the full disk swallowed is found again.
  void OnOutOfSpace(const Error& error);
  /// After a round that succeeded: the next full disk is a new one.
  void OnSuccess() { is_full_ = false; }

 private:
  ShareContext& context_;
  bool was_away_ = false;
  bool is_full_ = false;  ///< and that was reported
};

}  // namespace ferrox::indexd
