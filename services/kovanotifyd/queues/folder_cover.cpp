#include "services/kovanotifyd/queues/folder_cover.h"

#include <algorithm>
#include <queue>
#include <string_view>
#include <utility>

#include "base/path.h"

namespace ferrox::notifyd {

namespace {

/// Orders paths so that what lies below a folder comes right behind it.
bool IsBefore(const ComparedFolder& a, const ComparedFolder& b) {
  const auto rank = [](char c) { return c == '/' ? 0 : 1 + static_cast<unsigned char>(c); };
  return std::lexicographical_compare(a.path.begin(), a.path.end(), b.path.begin(), b.path.end(),
                                      [&](char x, char y) { return rank(x) < rank(y); });
}

/// Sorts the folders and removes those that lie in another one.
void DropCovered(std::vector<ComparedFolder>& folders) {
  std::sort(folders.begin(), folders.end(), IsBefore);
  size_t kept = 0;
  for (ComparedFolder& folder : folders) {
    if (kept > 0 && base::IsAtOrBelow(folder.path, folders[kept - 1].path)) continue;
    std::swap(folders[kept++], folder);
  }
  folders.resize(kept);
}

/// A range of the sorted folders with the deepest folder that contains all of them, by which they can be replaced.
struct Group {
  size_t begin;
  size_t end;
  size_t folder_size;  ///< that folder is any of their paths cut to this length
  std::vector<size_t>
      name_ends;  ///< for each name in that folder, the end of its part of the range; none for one folder
};

Group GroupOf(const std::vector<ComparedFolder>& folders, size_t begin, size_t end) {
  const std::string& first = folders[begin].path;
  if (end - begin == 1) return {begin, end, first.size(), {}};
  // The list being sorted, what the first and the last path have in common, all have.
  const std::string& last = folders[end - 1].path;
  const auto differs = std::mismatch(first.begin(), first.end(), last.begin(), last.end()).first;
  Group group = {begin, end, first.rfind('/', static_cast<size_t>(differs - first.begin()) - 1), {}};
  const auto name_of = [&](size_t i) {
    const std::string_view below = std::string_view(folders[i].path).substr(group.folder_size + 1);
    return below.substr(0, below.find('/'));
  };
  for (size_t i = begin + 1; i != end; ++i) {
    if (name_of(i) != name_of(i - 1)) group.name_ends.push_back(i);
  }
  group.name_ends.push_back(end);
  return group;
}

/// One group for each watched folder that contains some; those in a watched folder in another one may be in its group.
std::vector<Group> GroupsByRoot(const std::vector<ComparedFolder>& folders) {
  std::vector<Group> groups;
  for (size_t begin = 0; begin != folders.size();) {
    const std::string_view root = std::string_view(folders[begin].path).substr(0, folders[begin].root_size);
    size_t end = begin + 1;
    while (end != folders.size() && base::IsAtOrBelow(folders[end].path, root)) ++end;
    groups.push_back(GroupOf(folders, begin, end));
    begin = end;
  }
  return groups;
}

}  // namespace

std::vector<ComparedFolder> CoverFolders(std::vector<ComparedFolder> folders, size_t most) {
  DropCovered(folders);
  const auto has_more_names = [](const Group& a, const Group& b) { return a.name_ends.size() > b.name_ends.size(); };
  std::priority_queue<Group, std::vector<Group>, decltype(has_more_names)> open(has_more_names, GroupsByRoot(folders));
  // Starts with few high folders, and splits the one with the fewest names in it as long as there are not too many.
  std::vector<ComparedFolder> cover;
  while (!open.empty()) {
    const Group group = open.top();
    open.pop();
    const size_t names = group.name_ends.size();
    if (names == 0 || cover.size() + open.size() + names > most) {
      const ComparedFolder& first = folders[group.begin];
      cover.push_back({group.folder_size == 0 ? "/" : first.path.substr(0, group.folder_size), first.root_size});
      continue;
    }
    size_t begin = group.begin;
    for (const size_t end : group.name_ends) open.push(GroupOf(folders, std::exchange(begin, end), end));
  }
  DropCovered(cover);
  return cover;
}

}  // namespace ferrox::notifyd
