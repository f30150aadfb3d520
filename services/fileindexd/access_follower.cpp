#include "services/fileindexd/access_follower.h"

#include <sys/stat.h>

#include <cstddef>
#include <cstdint>
#include <vector>

#include "base/path.h"
#include "services/fileindexd/file_presence.h"

namespace ferrox::indexd {

namespace {

constexpr unsigned kRecordedAtOnce = 1000;

}  // namespace

void AccessFollower::Start() {
  thread_.Start([this] {
    RecordChanges();
    return true;
  });
}

void AccessFollower::RecordChanges() {
  const std::set<std::string> paths = PathsOf(tail_.NextAttributeChanges());
  if (paths.empty()) return;
  std::vector<std::string> some;
  for (auto at = paths.begin(); at != paths.end();) {
    some.push_back(*at++);
    if (some.size() < kRecordedAtOnce && at != paths.end()) continue;
    context_.interruption.Check();
    (void)context_.writer.RecordAccess(some);
    some.clear();
  }
  // The folders that have no documents may be meant by what changed at or above a configured one.
  context_.anchors.Record();
  context_.writer.Commit();
}

/// With the other names of files that have several, as far as the index knows them.
std::set<std::string> AccessFollower::PathsOf(const AttributeChanges& changes) {
  std::set<std::string> paths;
  std::set<uint64_t> files = changes.files;
  for (const std::string& path : changes.paths) {
    struct stat status = {};
    if (!base::IsAtOrBelow(path, context_.root) || context_.exclusions.LeavesOutAll(path)) continue;
    if (PresenceOf(path, status) != Presence::kThere) continue;
    if (S_ISREG(status.st_mode) && status.st_nlink > 1) files.insert(status.st_ino);
    paths.insert(path);
  }
  for (const uint64_t file : files) {
    context_.interruption.Check();
    std::string after;
    for (size_t found = kRecordedAtOnce; found == kRecordedAtOnce;) {
      const std::vector<IndexedEntry> page = context_.index.OfFile(file, after, kRecordedAtOnce);
      for (const IndexedEntry& entry : page) paths.insert(entry.path);
      found = page.size();
      if (found > 0) after = page.back().path;
    }
  }
  return paths;
}

}  // namespace ferrox::indexd
