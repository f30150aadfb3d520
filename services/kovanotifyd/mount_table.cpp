#include "services/kovanotifyd/mount_table.h"

#include <fcntl.h>

#include <fstream>
#include <sstream>

namespace ferrox::notifyd {

MountTable::MountTable(const char* path) : path_(path), fd_(open(path, O_RDONLY | O_CLOEXEC)) { Read(); }

/// "36 35 98:0 /root /mount/point options [more]... - ext4 source options"; the options may change.
void MountTable::Read() {
  lines_.clear();
  std::ifstream table(path_);
  for (std::string text; std::getline(table, text);) {
    std::istringstream fields(text);
    uint64_t id = 0;
    Line line;
    std::string device, root, point;
    if (!(fields >> id >> line.parent >> device >> root >> point)) continue;
    line.entry = device + " " + root + " " + point;
    lines_[id] = std::move(line);
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
  const auto line = lines_.find(mount.id);
  return line != lines_.end() && line->second.entry == mount.entry;
}

}  // namespace ferrox::notifyd
