#include "services/kovanotifyd/queues/watch_rules.h"

#include <algorithm>
#include <utility>

namespace ferrox::notifyd {

namespace {

/// Whether a component of `below`, which begins with "/" or is empty, has one of the names.
bool HasComponent(std::string_view below, const std::vector<std::string>& names) {
  if (names.empty()) return false;
  while (!below.empty()) {
    below.remove_prefix(1);
    const std::string_view component = below.substr(0, below.find('/'));
    if (std::find(names.begin(), names.end(), component) != names.end()) return true;
    below.remove_prefix(component.size());
  }
  return false;
}

std::string WithoutTrailingSlash(std::string path) {
  while (!path.empty() && path.back() == '/') path.pop_back();
  return path;
}

}  // namespace

WatchRules::WatchRules(const std::map<std::string, std::vector<QueueWatch>>& queues) : seen_(queues.size()) {
  std::map<std::string, std::vector<Rule>> rules;
  size_t queue = 0;
  for (const auto& [name, watches] : queues) {
    for (const QueueWatch& watch : watches) Add(queue, watch, rules);
    ++queue;
  }
  for (auto& [path, of_path] : rules) {
    std::vector<size_t>& watchers = by_path_[path.empty() ? "/" : path];
    for (const Rule& rule : of_path) watchers.push_back(rule.queue);
    rules_.Insert(path, std::move(of_path));
  }
}

/// For a folder that a queue names twice, the masks are joined, and only names that both ignore are ignored.
void WatchRules::Add(size_t queue, const QueueWatch& watch, std::map<std::string, std::vector<Rule>>& rules) {
  const std::string path = WithoutTrailingSlash(watch.path);
  std::vector<Rule>& of_path = rules[path];
  if (of_path.empty() || of_path.back().queue != queue) {
    of_path.push_back({queue, watch.mask, path.size(), watch.ignore});
    return;
  }
  Rule& rule = of_path.back();
  rule.mask |= watch.mask;
  (void)std::erase_if(rule.ignore, [&watch](const std::string& name) {
    return std::find(watch.ignore.begin(), watch.ignore.end(), name) == watch.ignore.end();
  });
}

const std::vector<WatchRules::Match>& WatchRules::Collect(std::string_view path, std::vector<Match>& matches) {
  matches.clear();
  ++lookup_;
  rules_.VisitUpwards(path, [&](const std::vector<Rule>& of_path) {
    for (const Rule& rule : of_path) {
      if (std::exchange(seen_[rule.queue], lookup_) == lookup_) continue;
      if (HasComponent(path.substr(rule.root_size), rule.ignore)) continue;
      matches.push_back({rule.queue, rule.mask, rule.root_size});
    }
    return false;
  });
  std::sort(matches.begin(), matches.end(), [](const Match& a, const Match& b) { return a.queue < b.queue; });
  return matches;
}

}  // namespace ferrox::notifyd
