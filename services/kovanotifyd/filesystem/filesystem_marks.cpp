#include "services/kovanotifyd/filesystem/filesystem_marks.h"

#include <fcntl.h>

#include <cerrno>
#include <utility>

#include "base/unique_fd.h"
#include "common/file_util.h"

namespace ferrox::notifyd {

namespace {

constexpr uint64_t kMask = FAN_CREATE | FAN_DELETE | FAN_RENAME | FAN_MODIFY | FAN_CLOSE_WRITE | FAN_ATTRIB | FAN_ONDIR;
constexpr uint64_t kCookieMask = FAN_ATTRIB | FAN_EVENT_ON_CHILD;
/// Without FAN_RENAME, since a rename may lead out of a quiet folder, and FAN_ATTRIB, by which the cookie is noticed.
constexpr uint64_t kQuietMask = FAN_CREATE | FAN_DELETE | FAN_MODIFY | FAN_CLOSE_WRITE;

HandleKey KeyOfPath(FanGroup& group, const std::string& path) {
  const base::UniqueFd folder(open(path.c_str(), O_PATH | O_DIRECTORY | O_CLOEXEC));
  return folder.Valid() ? group.KeyOf(folder.Get()) : HandleKey();
}

}  // namespace

std::string FilesystemMarks::Open() {
  if (group_.IsOpen()) return "";
  std::string reason = group_.Open();
  if (!reason.empty()) return reason;
  const std::string folder = Dirname(cookie_);
  cookie_folder_ = KeyOfPath(group_, folder);
  cookie_name_ = Basename(cookie_);
  const int error = group_.Mark(folder, FanGroup::Scope::kFolder, kCookieMask);
  if (error == 0 && !cookie_folder_.empty()) return "";
  reason = folder + ": " + FanGroup::Reason(error != 0 ? error : EOPNOTSUPP, FanGroup::Scope::kFolder);
  group_ = FanGroup();
  return reason;
}

std::string FilesystemMarks::Mark(const std::string& root, int folder, const HandleKey& key) {
  const int error = group_.Mark(folder, FanGroup::Scope::kFileSystem, kMask);
  if (error != 0) return FanGroup::Reason(error, FanGroup::Scope::kFileSystem);
  return mounts_.Add(root, folder, key);
}

void FilesystemMarks::Release(const HandleKey& key) {
  const base::UniqueFd folder = mounts_.Open(key, O_RDONLY | O_DIRECTORY);
  if (folder.Valid()) (void)group_.Unmark(folder.Get(), FanGroup::Scope::kFileSystem, kMask);
  mounts_.Close();
  mounts_.Remove(key);
}

bool FilesystemMarks::IsCookie(const FanRecord& record) const {
  return (record.mask & FAN_ATTRIB) != 0 && record.name == cookie_name_ && record.folder == cookie_folder_;
}

std::vector<HandleKey> FilesystemMarks::QuietFolders() {
  std::vector<HandleKey> keys;
  for (const std::string& path : quiet_folders_) {
    HandleKey key = KeyOfPath(group_, path);
    if (!key.empty()) keys.push_back(std::move(key));
  }
  return keys;
}

void FilesystemMarks::Ignore(const FanRecord& record) {
  if (!can_ignore_ || (record.mask & kQuietMask) == 0) return;
  const base::UniqueFd folder = mounts_.Open(record.folder, O_RDONLY | O_DIRECTORY);
  if (folder.Valid()) can_ignore_ = group_.Ignore(folder.Get(), kQuietMask) != EINVAL;
}

}  // namespace ferrox::notifyd
