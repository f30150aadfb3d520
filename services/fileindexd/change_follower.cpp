#include "services/fileindexd/change_follower.h"

#include <algorithm>

#include "services/fileindexd/file_presence.h"

namespace ferrox::indexd {

namespace {

using std::chrono::steady_clock;

/// With more early writes than this, the follower stops: the next pass writes the other files. Bounds memory.
constexpr size_t kEarlyWritesMax = 20000;

}  // namespace

ChangeFollower::ChangeFollower(const Context& context)
    : context_(context),
      rules_(context.share, context.root, context.folders),
      tasks_(context.pool, context.interruption),
      tail_(context.queue_path) {
  tasks_.SetUrgent(true);
}

void ChangeFollower::Start() {
  thread_ = std::thread([this] { Follow(); });
}

void ChangeFollower::Stop() {
  {
    const base::MutexLock lock(mutex_);
    stopping_ = true;
  }
  stop_changed_.NotifyAll();
  if (thread_.joinable()) thread_.join();
}

void ChangeFollower::ThrowIfFailed() {
  const base::MutexLock lock(mutex_);
  if (failure_) std::rethrow_exception(failure_);
}

void ChangeFollower::Follow() {
  const InterruptionScope scope(context_.interruption);
  try {
    auto took = steady_clock::duration::zero();
    while (WaitForNextRead(took) && early_writes_.size() <= kEarlyWritesMax) {
      const auto begin = steady_clock::now();
      WriteChangedFiles();
      took = steady_clock::now() - begin;
    }
  } catch (...) {
    const base::MutexLock lock(mutex_);
    failure_ = std::current_exception();
  }
}

/// Waits at least as long as the last read and its writes took, so that at most half of the time goes into early
/// writes, however many changes there are. @return false when the follower is to stop.
bool ChangeFollower::WaitForNextRead(steady_clock::duration last_took) {
  const auto end = steady_clock::now() + std::max<steady_clock::duration>(context_.interval, last_took);
  const base::MutexLock lock(mutex_);
  while (!stopping_ && steady_clock::now() < end) (void)stop_changed_.WaitUntil(mutex_, end);
  return !stopping_;
}

void ChangeFollower::WriteChangedFiles() {
  struct stat status = {};
  bool any = false;
  for (const std::string& path : tail_.NextChangedFiles()) {
    if (PresenceOf(path, status) != Presence::kThere || !rules_.CanBeIndexed(path)) continue;
    early_writes_.insert(path);
    tasks_.Submit([this, path] { context_.writer.Write(path); });
    any = true;
  }
  if (!any) return;
  tasks_.Wait();
  context_.writer.Commit();
}

}  // namespace ferrox::indexd
