#include "services/kovanotifyd/queues/folder_cover.h"

#include <algorithm>
#include <queue>
#include <string_view>
#include <utility>

namespace ferrox::notifyd {

namespace {

/// Orders paths so that what lies below a folder comes right behind it.
bool IsBefore(const Place& a, const Place& b) {
  const auto rank = [](char c) { return c == '/' ? 0 : 1 + static_cast<unsigned char>(c); };
  return std::lexicographical_compare(a.path.begin(), a.path.end(), b.path.begin(), b.path.end(),
                                      [&](char x, char y) { return rank(x) < rank(y); });
}

bool IsAtOrBelow(std::string_view path, std::string_view folder) {
  return path.starts_with(folder) && (path.size() == folder.size() || path[folder.size()] == '/' || folder == "/");
}

/// In order, without those that another one covers.
void DropCovered(std::vector<Place>& places) {
  std::sort(places.begin(), places.end(), IsBefore);
  size_t kept = 0;
  for (Place& place : places) {
    if (kept > 0 && IsAtOrBelow(place.path, places[kept - 1].path)) continue;
    std::swap(places[kept++], place);
  }
  places.resize(kept);
}

/// Neighbours in the ordered list that one folder may stand for: the deepest that holds them all.
struct Group {
  size_t begin;
  size_t end;
  size_t folder_size;             ///< the folder is any of their paths cut to that length
  std::vector<size_t> name_ends;  ///< where, for each name in the folder, its places end; none for a single place
};

Group GroupOf(const std::vector<Place>& places, size_t begin, size_t end) {
  const std::string& first = places[begin].path;
  if (end - begin == 1) return {begin, end, first.size(), {}};
  // What the first and the last have in common, all have. They differ behind the slash of the folder's last name.
  const std::string& last = places[end - 1].path;
  const auto differs = std::mismatch(first.begin(), first.end(), last.begin(), last.end()).first;
  Group group = {begin, end, first.rfind('/', static_cast<size_t>(differs - first.begin()) - 1), {}};
  const auto name_of = [&](size_t i) {
    const std::string_view below = std::string_view(places[i].path).substr(group.folder_size + 1);
    return below.substr(0, below.find('/'));
  };
  for (size_t i = begin + 1; i != end; ++i) {
    if (name_of(i) != name_of(i - 1)) group.name_ends.push_back(i);
  }
  group.name_ends.push_back(end);
  return group;
}

/// A group for each root that has places, but none for a root in another one as far as that is met before.
std::vector<Group> GroupsByRoot(const std::vector<Place>& places) {
  std::vector<Group> groups;
  for (size_t begin = 0; begin != places.size();) {
    const std::string_view root = std::string_view(places[begin].path).substr(0, places[begin].root_size);
    size_t end = begin + 1;
    while (end != places.size() && IsAtOrBelow(places[end].path, root)) ++end;
    groups.push_back(GroupOf(places, begin, end));
    begin = end;
  }
  return groups;
}

}  // namespace

std::vector<Place> CoverPlaces(std::vector<Place> places, size_t most) {
  DropCovered(places);
  const auto has_more_names = [](const Group& a, const Group& b) { return a.name_ends.size() > b.name_ends.size(); };
  std::priority_queue<Group, std::vector<Group>, decltype(has_more_names)> open(has_more_names, GroupsByRoot(places));
  // From the top downwards, a folder is given up for those in it as long as these are not too many together.
  std::vector<Place> cover;
  while (!open.empty()) {
    const Group group = open.top();
    open.pop();
    const size_t names = group.name_ends.size();
    if (names == 0 || cover.size() + open.size() + names > most) {
      const Place& first = places[group.begin];
      cover.push_back({group.folder_size == 0 ? "/" : first.path.substr(0, group.folder_size), first.root_size});
      continue;
    }
    size_t begin = group.begin;
    for (const size_t end : group.name_ends) open.push(GroupOf(places, std::exchange(begin, end), end));
  }
  DropCovered(cover);
  return cover;
}

}  // namespace ferrox::notifyd
