#include "services/fileindexd/retry_policy.h"

#include <algorithm>
#include <utility>

#include "common/error.h"

namespace ferrox::indexd {

namespace {

using std::chrono::milliseconds;
using std::chrono::seconds;
using State = ShareStatus::State;

struct Row {
  Problem problem;
  State state;
  const char* sentence;  ///< null: the failure's own text
  bool fails_syncs;
  milliseconds first, longest;
};

/// In the order of Problem. What passes by itself within moments fails no sync.
constexpr Row kRows[] = {
    {Problem::kNoSpace, State::kWaitingForSpace,
     "less than 100 MiB are free; indexing goes on by itself when there is more", true, seconds(10), seconds(300)},
    {Problem::kFolderAway, State::kWaitingForVolume, nullptr, true, {}, {}},  // always the interval of the volume
    {Problem::kEngineUnreachable, State::kWaitingForEngine,
     "the search engine does not answer; start it with 'fileindexctl up'", true, seconds(1), seconds(30)},
    {Problem::kContentUnavailable, State::kWaitingForContent, nullptr, true, seconds(1), seconds(30)},
    {Problem::kIndexPaused, State::kPaused, "the share's index is paused; 'fileindexctl share resume' resumes it", true,
     milliseconds(500), seconds(10)},
    {Problem::kIndexUpgrading, State::kWaitingForEngine, nullptr, true, seconds(1), seconds(1)},
    {Problem::kIndexMissing, State::kWaitingForEngine, nullptr, false, milliseconds(500), seconds(2)},
    {Problem::kEngineRestarted, State::kWaitingForEngine, nullptr, false, milliseconds(100), seconds(2)},
    {Problem::kOther, State::kError, nullptr, true, seconds(2), seconds(300)},
    {Problem::kUnexpected, State::kError, nullptr, true, seconds(10), seconds(300)},
};

}  // namespace

Retry RetryPolicy::OnError(const Failure& failure, TimePoint now) {
  if (std::exchange(last_code_, failure.code) != failure.code) {
    delay_ = milliseconds(0);
    failing_since_ = now;
  }
  return RetryAfter(Classify(failure));
}

/// The delay goes on growing from that of an Error before it.
Retry RetryPolicy::OnUnexpected() { return RetryAfter(Problem::kUnexpected); }

void RetryPolicy::OnSuccess() {
  delay_ = milliseconds(0);
  last_code_ = 0;
}

bool RetryPolicy::HasFailedFor(int code, milliseconds duration, TimePoint now) const {
  const auto since = last_code_ == code ? failing_since_ : now;
  return now - since >= duration;
}

Problem RetryPolicy::Classify(const Failure& failure) const {
  if (failure.out_of_space) return Problem::kNoSpace;
  if (failure.folder_away && failure.code == Error::kPathNotIndexable) return Problem::kFolderAway;
  if (failure.code == Error::kEngineUnreachable) return Problem::kEngineUnreachable;
  if (failure.code == Error::kParseFailed) return Problem::kContentUnavailable;
  if (failure.code == Error::kEngineIndexPaused) return Problem::kIndexPaused;
  if (failure.code == Error::kEngineIndexUpgrading) return Problem::kIndexUpgrading;
  if (failure.code == Error::kEngineNoSuchIndex) return Problem::kIndexMissing;
  // An engine that was killed fails one request so that what it had not committed is sent again; a second one in a row
  // is a storage that does not work.
  if (failure.code == Error::kEngineStorage && !IsFailing()) return Problem::kEngineRestarted;
  return Problem::kOther;
}

Retry RetryPolicy::RetryAfter(Problem problem) {
  const Row& row = kRows[static_cast<size_t>(problem)];
  const bool is_first = !IsFailing();
  delay_ = problem == Problem::kFolderAway ? volume_poll_ : std::clamp(2 * delay_, row.first, row.longest);
  return {problem, row.state, row.sentence, row.fails_syncs, is_first, delay_};
}

}  // namespace ferrox::indexd
