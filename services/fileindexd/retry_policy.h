#pragma once

#include <chrono>

#include "services/fileindexd/share_status.h"

namespace ferrox::indexd {

/// Why a round of a share's worker failed, as far as what follows depends on it.
enum class Problem {
  kNoSpace,             ///< the volume of the index is full
  kFolderAway,          ///< the share's folder, or the volume that it lies on, is not there
  kEngineUnreachable,   ///< the search engine does not answer
  kContentUnavailable,  ///< content extraction as a whole does not work
  kIndexPaused,         ///< the engine has the share's index paused
  kIndexUpgrading,      ///< the engine brings the index's file to a newer format
  kIndexMissing,        ///< the engine has no index of the share
  kEngineRestarted,     ///< the engine lost what it had not committed, and says so once
  kOther,               ///< any other Error
  kUnexpected,          ///< an exception that is no Error
};

/// What the worker does after a problem: the state that it shows, and when it tries again.
struct Retry {
  Problem problem = Problem::kOther;
  ShareStatus::State state = ShareStatus::State::kError;
  const char* sentence = nullptr;  ///< the state's detail; null: the failure's own text
  bool fails_syncs = true;         ///< those who wait for the share's changes get the detail; else they wait on
  bool is_first = true;            ///< not a repetition of the same failure
  std::chrono::milliseconds delay{0};
};

/// Decides how a share's worker goes on after failed rounds, by a table: each problem has its state and its delays,
/// which double from the first to the longest while the same error comes again. Asks nothing of the system and holds
/// no lock: it belongs to the worker's thread, and a test can run through all of it.
class RetryPolicy {
 public:
  using TimePoint = std::chrono::steady_clock::time_point;

  /// What the policy needs to know of a failed round.
  struct Failure {
    int code = 0;  ///< of the Error
    bool out_of_space = false;
    bool folder_away = false;
  };

  /// `volume_poll` is the delay, which does not grow, while the share's folder is away.
  explicit RetryPolicy(std::chrono::milliseconds volume_poll) : volume_poll_(volume_poll) {}

  Retry OnError(const Failure& failure, TimePoint now);
  /// After an exception that is no Error.
  Retry OnUnexpected();
  void OnSuccess();

  /// Whether the last round failed: changes of the queue do not end the wait for the next then.
  bool IsFailing() const { return delay_.count() > 0; }
  /// Whether the last rounds failed with this error, and have done so for `duration`.
  bool HasFailedFor(int code, std::chrono::milliseconds duration, TimePoint now) const;

 private:
  Problem Classify(const Failure& failure) const;
  Retry RetryAfter(Problem problem);

  std::chrono::milliseconds volume_poll_;
  std::chrono::milliseconds delay_{0};  ///< the last; 0 when no failure precedes
  int last_code_ = 0;
  TimePoint failing_since_;  ///< with that code
};

}  // namespace ferrox::indexd
