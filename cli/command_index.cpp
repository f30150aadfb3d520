#include <poll.h>
#include <unistd.h>

#include <algorithm>
#include <chrono>
#include <cstdio>

#include "cli/ask.h"
#include "cli/command_table.h"
#include "cli/configuration_change.h"
#include "cli/escape.h"
#include "cli/format.h"
#include "cli/left_out.h"
#include "cli/progress.h"
#include "common/error.h"
#include "common/file_util.h"
#include "fileindex/elastic/elastic_control.h"
#include "fileindex/folders/folder_mgr.h"
#include "fileindex/operations/index_mgr.h"
#include "fileindex/queue/event.h"
#include "fileindex/queue/queue_mgr.h"
#include "fileindex/status_mgr.h"
#include "fileindex/util.h"
#include "sdk/share.h"
#include "wire/engine_requests.h"

/// Comparing a share with its index, making the index anew, and waiting for either. A comparison is an event in the
/// share's queue, which the index daemon carries out when it comes to it; the tool asks the daemon for its status to
/// see how far it is.
namespace ferrox::cli {

namespace {

using SteadyClock = std::chrono::steady_clock;

/// How long between two looks at the daemon's status.
constexpr int kPollMs = 100;
/// After this long in an error, or waiting for something else, the command gives up and says why; the daemon itself
/// goes on trying.
constexpr std::chrono::seconds kErrorPatience(5);
constexpr std::chrono::seconds kWaitPatience(30);

/// What a comparison is about: the share's name, its folder, and the queue into which its events go.
struct Share {
  std::string name;
  std::string path;
  std::string queue_path;
};

/// @throws Error kNoSuchShare; Failure when no folder of it is indexed.
Share OpenShare(const std::string& name) {
  const sdk::SDKShare share(IndexedShare(name));
  return {name, share.GetPath(), share.GetQueuePath()};
}

/// The library itself marks the share when its queue has a damaged line and takes no event.
void QueueReindex(const Share& share) {
  try {
    if (!MarkIfBusy(share.name)) fileindex::AddCustomEvent(fileindex::EVENT_REINDEX, share.path, "", Json::Value());
  } catch (const Error& error) {
    if (error.Code() != Error::kMalformedEvent && error.Code() != Error::kBadArgument) throw;
  }
  NotifySettingChanged(share.name);
}

/// The index daemon's entry of the share; null when it does not work on it. @throws Failure when it does not answer.
Json::Value ShareStatusOf(const std::string& name) { return ShareIn(AskIndexDaemon("status", Json::Value()), name); }

/// Whether a comparison is still to come or goes on: a rebuild, the bit in the status file, or the event in the queue.
/// A queue that cannot be read is taken for done only when the worker has nothing to do.
bool ReindexIsPending(const Share& share, const Json::Value& status) {
  if (status["index"].isObject() && status["index"].isMember("rebuilding")) return true;
  if ((fileindex::StatusMgr().GetShareStatus(share.name) & fileindex::StatusMgr::kNeedReindex) != 0) return true;
  try {
    return fileindex::QueueMgr(share.queue_path).IsFullPathHasReindex(share.path);
  } catch (const Error&) {
    return TextOf(status, "state") != "idle" || UintOf(status, "queued") != 0;
  }
}

/// Why the index daemon has no entry of the share.
[[noreturn]] void ThrowNotWorkedOn(const std::string& share) {
  if (IsPaused(share))
    throw Failure("share " + share + " is paused; 'fileindexctl share resume " + share + "' resumes it");
  throw Failure("the index daemon does not work on share " + share +
                "; restart it with 'fileindexctl down' and 'fileindexctl up");
}

/// A pause of everything: no use to wait for its end.
[[noreturn]] void ThrowPaused(const std::string& share) {
  const long long until = fileindex::StatusMgr().GetPauseInfo();
  throw Failure("indexing is paused" + (until > 0 ? " until " + Date(until) : "") + "; share " + share +
                " is compared afterwards, or now if you run 'fileindexctl resume'");
}

/// Returns the share's last status.
Json::Value WaitUntilDone(const Share& share) {
  Progress progress(isatty(STDERR_FILENO) == 1);
  auto last_good = SteadyClock::now();
  while (true) {
    Json::Value status = ShareStatusOf(share.name);
    if (status.isNull()) ThrowNotWorkedOn(share.name);
    const std::string state = TextOf(status, "state");
    const bool stuck = state == "error" || StringStartWith(state, "waiting");
    if (!stuck) last_good = SteadyClock::now();
    if (!ReindexIsPending(share, status)) return ShareStatusOf(share.name);
    if (state == "paused") ThrowPaused(share.name);
    if (SteadyClock::now() - last_good > (state == "error" ? kErrorPatience : kWaitPatience)) {
      throw Failure("share " + share.name + ": " + TextOf(status, "detail") +
                    "; the index daemon tries again by itself");
    }
    progress.Show(status);
    (void)poll(nullptr, 0, kPollMs);
  }
}

/// By how much a count has grown. The daemon counts from its start: a count that is smaller than before began anew
/// meanwhile.
uint64_t Grown(const Json::Value& before, const Json::Value& after, const char* key) {
  const uint64_t old_value = UintOf(before, key);
  const uint64_t new_value = UintOf(after, key);
  return new_value >= old_value ? new_value - old_value : new_value;
}

/// Shows what the comparison did as the difference of the daemon's counts before and after it.
int ReindexAndWait(const Share& share) {
  const auto begin = SteadyClock::now();
  const Json::Value before = ShareStatusOf(share.name);
  QueueReindex(share);
  const Json::Value after = WaitUntilDone(share);
  const std::chrono::duration<double> took = SteadyClock::now() - begin;
  (void)printf("%s: %s files examined, %s indexed, %s removed in %s\n", EscapeForTerminal(share.name).c_str(),
               Count(UintOf(after["comparison"], "examined")).c_str(), Count(Grown(before, after, "written")).c_str(),
               Count(Grown(before, after, "deleted")).c_str(), Duration(took.count()).c_str());
  return kDone;
}

}  // namespace

/// Without --wait the queue is all that is needed, and the daemon may be away.
int RunIndex(const Arguments& arguments) {
  const Share share = OpenShare(arguments.words[0]);
  if (arguments.Has("--wait")) return ReindexAndWait(share);
  QueueReindex(share);
  (void)printf("queued: share %s will be compared with its index\n", EscapeForTerminal(share.name).c_str());
  return kDone;
}

/// Nothing is begun without the daemon that fills the new index. One that the engine does not know it makes itself.
int RunRebuild(const Arguments& arguments) {
  const Share share = OpenShare(arguments.words[0]);
  if (ShareStatusOf(share.name).isNull()) ThrowNotWorkedOn(share.name);
  try {
    (void)AskEngine(wire::IndexRequest("index_rebuild", fileindex::elastic::GetFileIndexID(share.name)));
  } catch (const Refusal& refusal) {
    if (refusal.Code() != Error::kEngineNoSuchIndex) throw;
  }
  if (arguments.Has("--wait")) return ReindexAndWait(share);
  QueueReindex(share);
  (void)printf("started: the index of share %s is built again; 'fileindexctl status' shows how far it is\n",
               EscapeForTerminal(share.name).c_str());
  return kDone;
}

/// One share after the other, so that one whose index cannot be used costs only its own suggestions.
int RunSuggestRefresh(const Arguments& arguments) {
  const std::vector<std::string> shares = IndexedShares(arguments.words);
  if (shares.empty()) {
    (void)fprintf(stderr,
                  "no folder is indexed, so there is nothing to suggest; 'fileindexctl folder add' indexes one\n");
    return kNothingFound;
  }
  RequireEngine();
  size_t done = 0;
  LeftOut left_out;
  for (const std::string& share : shares) {
    const std::string database = sdk::SDKShare(share).GetDBName();
    if (left_out.Unless(share, [&] { fileindex::UpdateTermSuggestion({database}); })) ++done;
  }
  (void)printf("suggestions updated for %s shares\n", Count(done).c_str());
  left_out.Warn();
  return left_out.Empty() ? kDone : kIncomplete;
}

}  // namespace ferrox::cli
