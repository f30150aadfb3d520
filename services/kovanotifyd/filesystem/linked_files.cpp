#include "services/kovanotifyd/filesystem/linked_files.h"

#include <fcntl.h>

#include <cerrno>
#include <string>
#include <utility>

#include "services/kovanotifyd/filesystem/mounted_folders.h"

namespace ferrox::notifyd {

void LinkedFiles::OnLinks(const HandleKey& file) {
  alone_.erase(file);
  if (linked_.size() >= kFilesMax) {
    linked_.clear();
    has_forgotten_ = true;
  }
  linked_.insert(file);
}

std::optional<uint64_t> LinkedFiles::NumberToReport(const FanRecord& record) {
  if (record.target.empty() || alone_.count(record.target) != 0) return 0;
  const bool is_new = (record.mask & FAN_CREATE) != 0 && !has_forgotten_ && linked_.count(record.target) == 0;
  if (!is_new) return Examine(record);
  NoteAlone(record.target);
  return 0;
}

uint64_t LinkedFiles::NumberOf(const HandleKey& file, unsigned names_min) {
  if (file.empty() || (names_min > 1 && alone_.count(file) != 0)) return 0;
  const base::UniqueFd opened = mounts_.Open(file, O_PATH | O_NOFOLLOW);
  struct stat status = {};
  if (!opened.Valid() || fstat(opened.Get(), &status) != 0) return 0;
  return S_ISREG(status.st_mode) && status.st_nlink >= names_min ? status.st_ino : 0;
}

/// By the file's handle: its number of links, and whether the name in the record still leads to it.
std::optional<uint64_t> LinkedFiles::Examine(const FanRecord& record) {
  const base::UniqueFd file = mounts_.Open(record.target, O_PATH | O_NOFOLLOW);
  struct stat status = {};
  if (!file.Valid() && (errno == ESTALE || errno == ENOENT)) return 0;
  if (!file.Valid() || fstat(file.Get(), &status) != 0) return {};
  if (!S_ISREG(status.st_mode) || status.st_nlink == 0) return 0;
  if (status.st_nlink > 1 || mounts_.NumberOf(record.folder, record.name) != status.st_ino) return status.st_ino;
  NoteAlone(record.target);
  return 0;
}

void LinkedFiles::NoteAlone(const HandleKey& file) {
  if (alone_.size() >= kFilesMax) alone_.clear();
  alone_.insert(file);
}

void LinkedFiles::Rest() {
  linked_.clear();
  has_forgotten_ = false;
}

void LinkedFiles::Clear() {
  alone_.clear();
  linked_.clear();
  has_forgotten_ = true;
}

}  // namespace ferrox::notifyd
