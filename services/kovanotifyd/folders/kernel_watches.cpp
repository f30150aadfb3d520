#include "services/kovanotifyd/folders/kernel_watches.h"

#include <poll.h>

#include <cerrno>

namespace ferrox::notifyd {

namespace {

/// Ended in one call, which is to be short.
constexpr size_t kEndedAtOnce = 64;

std::string TooMany(const FolderPort::Limit& limit) {
  return "too many folders for the " + std::to_string(limit.watches) + " watches that " + limit.setting +
         " allows, of which 80 % are used at most; raise it";
}

}  // namespace

KernelWatches::KernelWatches(FolderPort& port, FolderTree& tree, uint64_t max)
    : port_(port), tree_(tree), max_(max != 0 ? max : port.WatchLimit().watches / 10 * 8) {
  if (max_ == 0) max_ = UINT64_MAX;
}

std::string KernelWatches::Reason(int error) const {
  return error == ENOSPC ? TooMany(port_.WatchLimit()) : port_.Reason(error);
}

void KernelWatches::Drop(Id id) {
  const FolderKey key = tree_.Key(id);
  if (key == 0) return;
  dropped_.emplace_back(key, port_.UnwatchesByPath() ? tree_.Path(id) : std::string());
  tree_.SetKey(id, 0);
}

void KernelWatches::RemoveFromTree(Id id) {
  tree_.Remove(id, [this](Id each) { Drop(each); });
}

void KernelWatches::EndDropped() {
  for (size_t i = 0; i < kEndedAtOnce && !dropped_.empty(); ++i) {
    const auto [key, path] = std::move(dropped_.back());
    dropped_.pop_back();
    if (tree_.ByKey(key) == FolderTree::kNone && key != kept_) port_.Unwatch(key, path);
  }
}

bool KernelWatches::IsAllRead() const {
  pollfd polled = {port_.Fd(), POLLIN, 0};
  return poll(&polled, 1, 0) == 0;
}

}  // namespace ferrox::notifyd
