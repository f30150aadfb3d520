#include "services/kovanotifyd/filesystem/filesystem_watcher.h"

#include <fcntl.h>

#include <cerrno>

#include "base/scope_exit.h"
#include "base/unique_fd.h"
#include "common/log.h"

namespace ferrox::notifyd {

namespace {

/// How often Read takes more records before it reports names in doubt: these are better read from disk when nothing is
/// waiting.
constexpr int kRoundsMax = 16;

}  // namespace

FilesystemWatcher::FilesystemWatcher(const Options& options)
    : mounts_(group_),
      marks_(group_, mounts_, options.cookie, options.quiet_folders),
      queue_(group_, mounts_, options.records_max),
      cache_(options.folders_max),
      locator_(cache_, queue_.Window(), queue_),
      roots_(cache_),
      finder_(locator_, roots_),
      linked_(mounts_),
      translator_({marks_, mounts_, queue_, locator_, finder_, roots_, history_, linked_}) {}

void FilesystemWatcher::Add(const WatchRoot& root) {
  Remove(root.path);
  to_add_[root.path] = root;
}

void FilesystemWatcher::Remove(const std::string& root) {
  to_add_.erase(root);
  if (!roots_.Has(root)) return;
  const HandleKey key = roots_.KeyOf(root);
  roots_.Remove(root);
  ReleaseUnused(key);
}

bool FilesystemWatcher::Advance(std::chrono::milliseconds at_most, WatchListener& listener) {
  const auto until = std::chrono::steady_clock::now() + at_most;
  const base::ScopeExit close([this] { mounts_.Close(); });
  while (!to_add_.empty()) {
    const std::string root = to_add_.begin()->first;
    to_add_.erase(to_add_.begin());
    const std::string reason = Begin(root);
    if (reason.empty()) {
      listener.OnCovered(root);
    } else {
      listener.OnRefused(root, reason);
    }
    if (std::chrono::steady_clock::now() >= until) break;
  }
  // Locating the folders above a root may have read records.
  if (!queue_.Window().IsEmpty()) TranslateWindow(listener);
  return !to_add_.empty();
}

/// "" or why the root cannot be watched.
std::string FilesystemWatcher::Begin(const std::string& root) {
  std::string reason = marks_.Open();
  if (!reason.empty()) return reason;
  const base::UniqueFd folder(open(root.c_str(), O_RDONLY | O_DIRECTORY | O_NOFOLLOW | O_CLOEXEC));
  if (!folder.Valid()) return "it cannot be opened: " + ErrnoText();
  const HandleKey key = group_.KeyOf(folder.Get());
  if (key.empty()) return FanGroup::Reason(EOPNOTSUPP, FanGroup::Scope::kFileSystem);
  reason = marks_.Mark(root, folder.Get(), key);
  if (reason.empty()) reason = Locate(root, key);
  if (!reason.empty()) ReleaseUnused(key);
  return reason;
}

/// What is in memory may be wrong for the root: its file system may have been unmounted and changed elsewhere, or is
/// seen through another mount now.
std::string FilesystemWatcher::Locate(const std::string& root, const HandleKey& key) {
  cache_.Clear();
  linked_.Clear();
  FolderPlace place;
  const FolderSource::Answer answer = queue_.ReadPlace(key, place);
  const FolderCache::Folder* found = locator_.Locate(key);
  if (found == nullptr || answer == FolderSource::Answer::kNowhere) return "what is above it cannot be found out";
  roots_.Add(root, *found);
  roots_.SetQuiet(marks_.QuietFolders());
  return "";
}

/// Of a file system that no root is on any more.
void FilesystemWatcher::ReleaseUnused(const HandleKey& key) {
  if (roots_.PathsOn(key).empty()) marks_.Release(key);
}

bool FilesystemWatcher::Read(WatchListener& listener) {
  const base::ScopeExit close([this] { mounts_.Close(); });
  const bool was_anything = queue_.ReadBatch();
  if (!was_anything) Rest();
  for (int round = 0; !queue_.Window().IsEmpty(); ++round) {
    TranslateWindow(listener);
    if (!history_.HasLoops()) continue;
    const bool is_more = queue_.ReadBatch();
    if (is_more && round < kRoundsMax) continue;
    ReportDoubts(listener);
    if (!is_more && queue_.Window().IsEmpty()) history_.Clear();
  }
  return was_anything;
}

/// Nothing is waiting in the kernel: nothing later can be joined with what was noted.
void FilesystemWatcher::Rest() {
  history_.Clear();
  linked_.Rest();
  queue_.Rest();
}

void FilesystemWatcher::TranslateWindow(WatchListener& listener) {
  RecordWindow& window = queue_.Window();
  while (!window.IsEmpty()) {
    if (window.Front().IsOverflow()) {
      OnLost(listener);
    } else {
      translator_.Translate(window.Front(), listener);
    }
    if (queue_.DropIfOverrun()) return OnLost(listener);
    window.Pop();
  }
  finder_.Reset();
}

/// Reports the names to which something came back, now that all records of them have been worked on.
void FilesystemWatcher::ReportDoubts(WatchListener& listener) {
  std::vector<std::string> paths;
  for (const auto& [target, places] : history_.Loops()) {
    if (cache_.Find(target) != nullptr && locator_.LocateAnew(target) == nullptr) cache_.Clear();
    for (const FolderPlace& place : places) {
      (void)finder_.Find(place.parent, place.name, paths, listener);
      for (const std::string& path : paths) listener.OnChange({Change::Kind::kUncertain, false, path});
    }
  }
}

/// Records were lost, and maybe those of moves of folders or roots.
void FilesystemWatcher::OnLost(WatchListener& listener) {
  cache_.Clear();
  history_.Clear();
  linked_.Clear();
  listener.OnLost();
  for (const std::string& root : roots_.Paths()) {
    listener.OnRootDisturbed(root);
    listener.OnCovered(root);
  }
}

}  // namespace ferrox::notifyd
