#include "services/kovanotifyd/roots/mount_table.h"

#include <fcntl.h>

#include <algorithm>
#include <fstream>
#include <iterator>
#include <sstream>

#include <kova/mountinfo.h>

#include "base/path.h"

namespace ferrox::notifyd {

namespace {

/// File systems whose every answer comes from another machine.
constexpr const char* kNetworkTypes[] = {"nfs",  "nfs4", "cifs",   "smb3",       "ceph",          "afs",
                                         "coda", "9p",   "lustre", "fuse.sshfs", "fuse.glusterfs"};

}  // namespace

MountTable::MountTable(const char* path) : path_(path), fd_(open(path, O_RDONLY | O_CLOEXEC)) {
  Read();
  changed_.clear();
}

/// A line is "36 35 98:0 /root /mount/point options [more]... - ext4 source options": id, parent's id, device, root.
/// The options may change while the mount stays.
void MountTable::Read() {
  const Lines before = std::exchange(lines_, {});
  std::ifstream table(path_);
  for (std::string text; std::getline(table, text);) {
    std::istringstream fields(text);
    uint64_t id = 0;
    Line line;
    std::string device, root, point;
    if (!(fields >> id >> line.parent >> device >> root >> point)) continue;
    line.entry = device + " " + root + " " + point;
    line.point = kova::PlainMountField(point);
    std::string type;
    const size_t separator = text.find(" - ");
    if (separator != std::string::npos)
      type = text.substr(separator + 3, text.find(' ', separator + 3) - separator - 3);
    line.is_network = std::find(std::begin(kNetworkTypes), std::end(kNetworkTypes), type) != std::end(kNetworkTypes);
    lines_[id] = std::move(line);
  }
  NoteMissing(before, lines_);
  NoteMissing(lines_, before);
}

/// Notes the mount points of `lines` that are not in `others`.
void MountTable::NoteMissing(const Lines& lines, const Lines& others) {
  for (const auto& [id, line] : lines) {
    const auto other = others.find(id);
    if (other == others.end() || other->second.entry != line.entry) changed_.insert(line.point);
  }
}

Mount MountTable::Find(uint64_t id) const {
  Mount mount = {id};
  for (auto line = lines_.find(id); line != lines_.end() && mount.beneath.size() <= lines_.size();
       line = lines_.find(line->second.parent)) {
    if (line->first == id) {
      mount.entry = line->second.entry;
    } else {
      mount.beneath.push_back(line->first);
    }
    if (line->second.parent == line->first) break;
  }
  return mount;
}

bool MountTable::IsMounted(const Mount& mount) const {
  if (mount.entry.empty()) return true;  // it never was in the table, as that of a changed root is not
  const auto line = lines_.find(mount.id);
  return line != lines_.end() && line->second.entry == mount.entry;
}

bool MountTable::IsUncovered(const Mount& mount, uint64_t id) const {
  return !IsMounted(mount) && std::find(mount.beneath.begin(), mount.beneath.end(), id) != mount.beneath.end();
}

bool MountTable::IsMountedAt(const std::string& point) const {
  return std::any_of(lines_.begin(), lines_.end(), [&point](const auto& line) { return line.second.point == point; });
}

uint64_t MountTable::MountOf(const std::string& path) const {
  uint64_t nearest = 0;
  size_t depth = 0;
  for (const auto& [id, line] : lines_) {
    if (line.point.size() < depth || !base::IsAtOrBelow(path, line.point)) continue;
    depth = line.point.size();
    nearest = id;
  }
  return nearest;
}

bool MountTable::IsNetwork(uint64_t id) const {
  const auto line = lines_.find(id);
  return line != lines_.end() && line->second.is_network;
}

}  // namespace ferrox::notifyd
