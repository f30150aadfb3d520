#include "services/fileindexd/tree_walk.h"

#include <dirent.h>
#include <fcntl.h>
#include <limits.h>

#include <algorithm>
#include <cerrno>
#include <cstring>
#include <set>
#include <string_view>

#include "base/files.h"
#include "base/unique_fd.h"

namespace ferrox::indexd {

/// A name of a folder, or what lies below it: `length` counts the "/" behind the name in the second case.
struct TreeWalk::Item {
  size_t offset;
  uint16_t length;
  bool below;
};

/// One folder on the way: its names one after the other, each with a "/" behind it, and their order.
struct TreeWalk::Level {
  base::UniqueFd folder;
  dev_t device = 0;
  bool indexed = false;  ///< the folder, and so all in it; else it is on the way to what is
  bool entered = false;  ///< has been returned
  std::string prefix;
  std::string names;
  std::vector<Item> items;  ///< first the names, then those below
  size_t next = 0;
  uint64_t links_examined = 0;
  std::set<std::string, std::less<>> not_entered;
  std::set<std::string> on_the_way;  ///< paths that patterns leave out, of folders that hold an indexed one

  std::string Name(const Item& item) const {
    return names.substr(item.offset, item.length - static_cast<size_t>(item.below));
  }
};

namespace {

/// Whether what cannot be opened for this reason holds nothing for the index. Any other reason says nothing about it.
bool MeansNothingThere(int error) {
  for (const int known : {ENOENT, ENOTDIR, ELOOP, EACCES, EPERM}) {
    if (error == known) return true;
  }
  return false;
}

bool IsFolder(int folder, const dirent& entry) {
  if (entry.d_type != DT_UNKNOWN) return entry.d_type == DT_DIR;
  struct stat status = {};
  return fstatat(folder, entry.d_name, &status, AT_SYMLINK_NOFOLLOW) == 0 && S_ISDIR(status.st_mode);
}

}  // namespace

TreeWalk::TreeWalk(const std::string& folder, const WalkRules& rules) : rules_(rules) {
  Entry entry;
  const bool indexed = rules_.place_of(folder) == Place::kIndexed;
  if (Descend(AT_FDCWD, folder, folder, indexed, entry)) first_ = std::make_unique<Entry>(entry);
  opened_ = !levels_.empty();
}

TreeWalk::~TreeWalk() = default;

bool TreeWalk::Next(Entry& entry) {
  if (first_) {
    entry = *first_;
    first_.reset();
    return true;
  }
  while (!levels_.empty()) {
    Level& level = *levels_.back();
    if (!level.entered) {
      level.entered = true;
      entry = {Entry::Kind::kEntered, level.prefix.substr(0, level.prefix.size() - 1), {}};
      return true;
    }
    if (level.next == level.items.size()) {
      levels_.pop_back();
      continue;
    }
    const Item item = level.items[level.next++];
    if (!item.below) {
      if (Find(level, item, entry)) return true;
      continue;
    }
    const std::string name = level.Name(item);
    const std::string path = level.prefix + name;
    const Place place = PlaceIn(level, path);
    if (place == Place::kOutside || level.not_entered.count(name) != 0) continue;
    if (Descend(level.folder.Get(), name, path, place == Place::kIndexed, entry)) return true;
  }
  return false;
}

TreeWalk::Place TreeWalk::PlaceIn(const Level& level, const std::string& path) const {
  if (!level.indexed) return rules_.place_of(path);
  return !level.on_the_way.empty() && level.on_the_way.count(path) != 0 ? Place::kOnTheWay : Place::kIndexed;
}

bool TreeWalk::Descend(int parent_fd, const std::string& name, const std::string& path, bool indexed, Entry& entry) {
  auto level = std::make_unique<Level>();
  level->folder.Reset(openat(parent_fd, name.c_str(), O_RDONLY | O_DIRECTORY | O_NOFOLLOW | O_CLOEXEC));
  struct stat status = {};
  int error = level->folder.Valid() && fstat(level->folder.Get(), &status) == 0 ? 0 : errno;
  if (error == 0) {
    level->device = status.st_dev;
    level->indexed = indexed;
    level->prefix = path + "/";
    errno = 0;
    ReadNames(*level);
    error = errno;
  }
  if (error == 0) {
    levels_.push_back(std::move(level));
    return false;
  }
  if (error != ENOENT) rules_.on_problem(path, error);
  if (MeansNothingThere(error)) return false;
  entry = {Entry::Kind::kUnknownBelow, path, {}};
  return true;
}

/// Leaves errno at 0 when all names could be read.
void TreeWalk::ReadNames(Level& level) {
  const int copy = fcntl(level.folder.Get(), F_DUPFD_CLOEXEC, 0);
  const base::OpenFolderPtr dir(copy < 0 ? nullptr : fdopendir(copy));
  if (!dir) return;
  bool has_ignore_file = false;
  while (true) {
    errno = 0;
    const dirent* entry = readdir(dir.get());
    if (entry == nullptr) break;
    const std::string name = entry->d_name;
    if (name == "." || name == ".." || rules_.skip_name(name)) continue;
    if (entry->d_type == DT_LNK) {
      ++links_skipped_;
      continue;
    }
    if (level.prefix.size() + name.size() >= PATH_MAX) {
      rules_.on_problem(level.prefix + name, ENAMETOOLONG);
      continue;
    }
    has_ignore_file = has_ignore_file || name == services::kIgnoreFileName;
    const auto length = static_cast<uint16_t>(name.size());
    level.items.push_back({level.names.size(), length, false});
    if (IsFolder(level.folder.Get(), *entry)) {
      level.items.push_back({level.names.size(), static_cast<uint16_t>(length + 1), true});
    }
    level.names += name + "/";
  }
  const int error = errno;
  if (level.indexed) DropExcluded(level, has_ignore_file);
  const std::string_view names = level.names;
  std::sort(level.items.begin(), level.items.end(), [names](const Item& left, const Item& right) {
    if (left.below != right.below) return right.below;
    return names.substr(left.offset, left.length) < names.substr(right.offset, right.length);
  });
  errno = error;
}

/// The item of what lies below a folder stands behind that of its name.
void TreeWalk::DropExcluded(Level& level, bool has_ignore_file) const {
  const auto exclusions = rules_.exclusions_in(level.prefix.substr(0, level.prefix.size() - 1), has_ignore_file);
  if (exclusions == nullptr) return;
  auto kept = level.items.begin();
  for (auto item = level.items.begin(); item != level.items.end();) {
    const bool is_folder = item + 1 != level.items.end() && (item + 1)->below;
    const auto end = item + (is_folder ? 2 : 1);
    const std::string_view name = std::string_view(level.names).substr(item->offset, item->length);
    Place place = Place::kIndexed;
    if (exclusions->LeavesOut(name, is_folder)) {
      const std::string path = level.prefix + std::string(name);
      place = is_folder ? rules_.place_of(path) : Place::kOutside;
      if (place == Place::kOnTheWay) level.on_the_way.insert(path);
    }
    kept = place == Place::kOutside ? kept : std::move(item, end, kept);
    item = end;
  }
  level.items.erase(kept, level.items.end());
}

bool TreeWalk::MayEnter(Level& level, std::string_view name, const std::string& path, const struct stat& status) {
  if (rules_.may_enter(path, status, level.device)) return true;
  level.not_entered.emplace(name);
  return false;
}

bool TreeWalk::Find(Level& level, const Item& item, Entry& entry) {
  const std::string name = level.Name(item);
  std::string path = level.prefix + name;
  const Place place = PlaceIn(level, path);
  if (place == Place::kOutside) return false;
  struct stat status = {};
  if (fstatat(level.folder.Get(), name.c_str(), &status, AT_SYMLINK_NOFOLLOW) != 0) {
    const int error = errno;
    if (error != ENOENT) rules_.on_problem(path, error);
    if (MeansNothingThere(error) || place == Place::kOnTheWay) return false;
    entry = {Entry::Kind::kUnknown, std::move(path), {}};
    return true;
  }
  if (S_ISLNK(status.st_mode)) {
    ++links_skipped_;
    return false;
  }
  if (S_ISDIR(status.st_mode) && !MayEnter(level, name, path, status)) return false;
  if (place == Place::kOnTheWay) return false;
  entry = {Entry::Kind::kFound, std::move(path), status};
  return true;
}

bool TreeWalk::Examine(
    const std::function<void(std::string_view name, const std::string& path, const struct stat&)>& take) {
  Level& level = *levels_.back();
  std::string path = level.prefix;
  level.links_examined = 0;
  for (const Item& item : level.items) {
    if (item.below) break;
    path.resize(level.prefix.size());
    path.append(level.names, item.offset, item.length);
    const char* const name = path.c_str() + level.prefix.size();
    const Place place = PlaceIn(level, path);
    if (place == Place::kOutside) continue;
    struct stat status = {};
    if (fstatat(level.folder.Get(), name, &status, AT_SYMLINK_NOFOLLOW) != 0) return false;
    if (S_ISLNK(status.st_mode)) {
      ++level.links_examined;
      continue;
    }
    if (S_ISDIR(status.st_mode) && !MayEnter(level, name, path, status)) continue;
    if (place == Place::kIndexed) take({name, item.length}, path, status);
  }
  return true;
}

void TreeWalk::SkipEntries() {
  Level& level = *levels_.back();
  while (level.next < level.items.size() && !level.items[level.next].below) ++level.next;
  links_skipped_ += level.links_examined;
}

}  // namespace ferrox::indexd
