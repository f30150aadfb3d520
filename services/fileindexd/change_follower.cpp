#include "services/fileindexd/change_follower.h"

#include <algorithm>

namespace ferrox::indexd {

namespace {

using std::chrono::steady_clock;

/// What is very much is left to the queue's own pass.
constexpr size_t kFilesMax = 20000;

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
    const std::lock_guard lock(mutex_);
    stopping_ = true;
  }
  stop_changed_.notify_all();
  if (thread_.joinable()) thread_.join();
}

void ChangeFollower::Check() {
  const std::lock_guard lock(mutex_);
  if (failure_) std::rethrow_exception(failure_);
}

void ChangeFollower::Follow() {
  const InterruptionScope scope(context_.interruption);
  try {
    auto took = steady_clock::duration::zero();
    while (WaitForNextLook(took) && written_.size() <= kFilesMax) {
      const auto begin = steady_clock::now();
      WriteChangedFiles();
      took = steady_clock::now() - begin;
    }
  } catch (...) {
    const std::lock_guard lock(mutex_);
    failure_ = std::current_exception();
  }
}

/// Half of the time at most goes into changes, however many there are. @return false when it is to stop.
bool ChangeFollower::WaitForNextLook(steady_clock::duration last_took) {
  std::unique_lock lock(mutex_);
  const auto wait = std::max<steady_clock::duration>(context_.interval, last_took);
  return !stop_changed_.wait_for(lock, wait, [this] { return stopping_; });
}

void ChangeFollower::WriteChangedFiles() {
  struct stat status = {};
  bool any = false;
  for (const std::string& path : tail_.NextChangedFiles()) {
    if (LookAt(path, status) != Presence::kThere || !rules_.CanBeIndexed(path)) continue;
    written_.insert(path);
    tasks_.Submit([this, path] { context_.writer.Write(path); });
    any = true;
  }
  if (!any) return;
  tasks_.Wait();
  context_.writer.Commit();
}

}  // namespace ferrox::indexd
