#include "services/fileindexd/change_follower.h"

#include <algorithm>
#include <vector>

#include "base/path.h"
#include "services/fileindexd/file_presence.h"

namespace ferrox::indexd {

namespace {

/// With more early writes than this, the follower stops: the next pass writes the other files. Bounds memory.
constexpr size_t kEarlyWritesMax = 20000;

}  // namespace

ChangeFollower::ChangeFollower(const Context& context)
    : context_(context),
      rules_(context.share, context.root, context.folders, context.exclusions),
      tasks_(context.pool, context.interruption),
      tail_(context.queue_path),
      thread_(context.interruption, context.interval, context.interval) {
  tasks_.SetUrgent(true);
}

void ChangeFollower::Start() {
  thread_.Start([this] {
    WriteChangedFiles();
    return early_writes_.size() <= kEarlyWritesMax;
  });
}

void ChangeFollower::WriteChangedFiles() {
  struct stat status = {};
  bool any = false;
  const std::vector<std::string> changed = tail_.NextChangedFiles();
  const auto is_ignore_file = [](const std::string& path) { return base::NameOf(path) == services::kIgnoreFileName; };
  // What the pass has read of them is older; of what came with the new ones, nothing is to be written for a moment.
  if (std::any_of(changed.begin(), changed.end(), is_ignore_file)) context_.exclusions.Forget();
  for (const std::string& path : changed) {
    if (rules_.IsExcluded(path) || PresenceOf(path, status) != Presence::kThere || !rules_.CanBeIndexed(path)) continue;
    early_writes_.insert(path);
    tasks_.Submit([this, path] { context_.writer.Write(path); });
    any = true;
  }
  if (!any) return;
  tasks_.Wait();
  context_.writer.Commit();
}

}  // namespace ferrox::indexd
