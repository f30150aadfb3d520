#include "services/fileindexd/worker_loop.h"

#include <syslog.h>

#include <exception>

#include "common/log.h"
#include "common/subject_error.h"
#include "services/support/settings_problem.h"

namespace ferrox::indexd {

namespace {

using std::chrono::milliseconds;
using std::chrono::steady_clock;

/// Rounds while an event is expected.
constexpr milliseconds kEventPoll(200);

/// How far an upgrade is, the engine alone can tell: its own words, without what the library puts before them.
std::string WordsOf(const Error& error) {
  const Subject subject = SubjectError::Of(error);
  return subject.kind == Subject::kEngineRefusal ? subject.name : error.what();
}

}  // namespace

WorkerLoop::WorkerLoop(ShareContext& context, IndexKeeper& keeper, InnerShareChanges& inner_shares)
    : context_(context),
      keeper_(keeper),
      inner_shares_(inner_shares),
      availability_(context),
      retry_(context.environment.volume_poll),
      round_(context, keeper, availability_, retry_) {}

/// The stop and the pause are tested again once the interruption is cleared, since their own request may be what was
/// cleared. After a failure only a Wake ends the wait early, so that a busy queue causes no busy retries.
void WorkerLoop::Run() {
  const InterruptionScope scope(context_.interruption);
  while (!context_.stopping) {
    if (context_.environment.pause.Paused()) {
      context_.status.SetState(ShareStatus::State::kPaused);
      context_.syncs.Failed(context_.syncs.Last(), "indexing is paused; 'fileindexctl resume' resumes it");
      keeper_.TryToTellShare();
      context_.watch.WaitForWake(context_.environment.pause.Left());
      continue;
    }
    context_.interruption.Clear();
    if (!MayWork()) continue;
    const milliseconds wait = Round();
    if (!MayWork()) continue;
    retry_.IsFailing() ? context_.watch.WaitForWake(wait) : (void)context_.watch.Wait(wait);
  }
}

/// @return how long to wait for the next round.
milliseconds WorkerLoop::Round() {
  settled_ = false;
  inner_shares_.RoundBegins();
  try {
    round_.Run();
    retry_.OnSuccess();
    availability_.OnSuccess();
    return OnSuccess();
  } catch (const Interrupted&) {
    context_.status.EndPass();
    return milliseconds(0);
  } catch (const Error& error) {
    context_.status.EndPass();
    return context_.stopping ? milliseconds(0) : OnFailure(error);
  } catch (const std::exception& error) {
    context_.status.EndPass();
    return OnUnexpected(error.what());
  }
}

milliseconds WorkerLoop::OnSuccess() {
  if (round_.AwaitsEvent()) {
    context_.status.SetState(ShareStatus::State::kStarting, "the index is from before a change that is yet to be told");
    return kEventPoll;
  }
  settled_ = true;
  context_.syncs.Done(round_.ServedSync());
  context_.status.SetState(ShareStatus::State::kIdle);
  return context_.watch.LongestWait();
}

milliseconds WorkerLoop::OnFailure(const Error& error) {
  keeper_.OnFailure(error.Code());
  const Retry retry =
      retry_.OnError({error.Code(), availability_.IsOutOfSpace(error), availability_.WasAway()}, steady_clock::now());
  const bool is_other = retry.problem == Problem::kOther;
  const std::string reason = is_other                                    ? services::Describe(error)
                             : retry.problem == Problem::kIndexUpgrading ? WordsOf(error)
                                                                         : error.what();
  if (is_other && retry.is_first) Log(LOG_ERR, "share %s: %s", context_.share.c_str(), reason.c_str());
  Report(retry, reason);
  if (retry.problem == Problem::kNoSpace) availability_.OnOutOfSpace(error);
  const bool paused_for_long =
      retry.problem == Problem::kIndexPaused &&
      retry_.HasFailedFor(Error::kEngineIndexPaused, context_.environment.patience, steady_clock::now());
  if (paused_for_long) keeper_.ResumeUnlessFoldersPaused();
  return retry.delay;
}

milliseconds WorkerLoop::OnUnexpected(const std::string& reason) {
  Log(LOG_ERR, "share %s: unexpected failure: %s", context_.share.c_str(), reason.c_str());
  const Retry retry = retry_.OnUnexpected();
  Report(retry, reason);
  return retry.delay;
}

/// In the status, and to those who wait for the share's changes.
void WorkerLoop::Report(const Retry& retry, const std::string& reason) {
  const std::string detail = retry.sentence != nullptr ? retry.sentence : reason;
  context_.status.SetState(retry.state, detail);
  if (retry.fails_syncs) context_.syncs.Failed(round_.ServedSync(), detail);
}

}  // namespace ferrox::indexd
