#include "base/ignore_patterns.h"

#include <algorithm>
#include <utility>

namespace base {

namespace {

/// Without the blanks at the end, but for one behind a backslash.
std::string_view WithoutTrailingBlanks(std::string_view text) {
  size_t end = 0;
  for (size_t i = 0; i < text.size(); ++i) {
    const bool escapes = text[i] == '\\';
    if (escapes && i + 1 < text.size()) ++i;
    if (escapes || text[i] != ' ') end = i + 1;
  }
  return text.substr(0, end);
}

bool IsAnyFolders(std::string_view text, size_t at) {
  return text.compare(at, 2, "**") == 0 && (at + 2 == text.size() || text[at + 2] == '/');
}

}  // namespace

bool IgnorePatterns::Add(std::string_view text, uint32_t line) {
  if (text.starts_with('#')) return false;
  text = WithoutTrailingBlanks(text);
  if (text.empty()) return false;
  Pattern pattern;
  pattern.text = text;
  pattern.line = line;
  pattern.takes_back = text.starts_with('!');
  if (pattern.takes_back) text.remove_prefix(1);
  pattern.folders_only = text.ends_with('/');
  if (pattern.folders_only) text.remove_suffix(1);
  const bool anchored = text.find('/') != std::string_view::npos;
  if (text.starts_with('/')) text.remove_prefix(1);

  bool is_possible = !text.empty();
  for (size_t at = 0; is_possible && at <= text.size(); ++at) {
    Segment segment;
    segment.any_folders = anchored && IsAnyFolders(text, at);
    is_possible = segment.name.Read(text, at) && !segment.name.Empty();
    pattern.segments.push_back(std::move(segment));
  }
  const auto number = static_cast<uint32_t>(patterns_.size());
  patterns_.push_back(std::move(pattern));
  if (!is_possible) return true;
  const Pattern& added = patterns_.back();
  const NamePattern& name = added.segments.front().name;
  if (anchored) {
    anchored_.push_back(number);
  } else if (name.IsPlain()) {
    plain_begin_ |= name.Begins();
    Note(plain_, name.Literal(), static_cast<int>(number), added.folders_only);
  } else if (name.IsExtension()) {
    Note(extensions_, name.Literal(), static_cast<int>(number), added.folders_only);
  } else {
    others_begin_ |= name.Begins();
    others_.push_back(number);
  }
  return true;
}

void IgnorePatterns::Note(ByName& table, std::string name, int pattern, bool folders_only) {
  Last& last = table[std::move(name)];
  (folders_only ? last.folder : last.any) = pattern;
}

int IgnorePatterns::Find(const ByName& table, std::string_view name, bool is_folder) {
  const auto found = table.find(name);
  if (found == table.end()) return kNone;
  return is_folder ? std::max(found->second.any, found->second.folder) : found->second.any;
}

/// A "**" may stand for no folder at all, so what follows it waits as well; at the end it stands for at least one name.
void IgnorePatterns::AddWaiting(State& state, uint32_t pattern, uint32_t segment) const {
  const std::vector<Segment>& segments = patterns_[pattern].segments;
  for (; segment < segments.size(); ++segment) {
    state.waiting.emplace_back(pattern, segment);
    if (!segments[segment].any_folders) return;
  }
}

IgnorePatterns::State IgnorePatterns::Begin() const {
  State state;
  for (const uint32_t pattern : anchored_) AddWaiting(state, pattern, 0);
  return state;
}

IgnorePatterns::State IgnorePatterns::Enter(const State& state, std::string_view name) const {
  State next;
  for (const auto& [pattern, segment] : state.waiting) {
    const Segment& waiting = patterns_[pattern].segments[segment];
    if (waiting.any_folders) {
      AddWaiting(next, pattern, segment);
    } else if (waiting.name.Matches(name)) {
      AddWaiting(next, pattern, segment + 1);
    }
  }
  std::sort(next.waiting.begin(), next.waiting.end());
  next.waiting.erase(std::unique(next.waiting.begin(), next.waiting.end()), next.waiting.end());
  return next;
}

int IgnorePatterns::Match(const State& state, std::string_view name, bool is_folder) const {
  const auto first = static_cast<unsigned char>(name.empty() ? '\0' : name.front());
  int last = plain_begin_.test(first) ? Find(plain_, name, is_folder) : kNone;
  const size_t dot = extensions_.empty() ? std::string_view::npos : name.rfind('.');
  if (dot != std::string_view::npos) last = std::max(last, Find(extensions_, name.substr(dot), is_folder));
  const auto matches = [&](uint32_t number, const Segment& segment) {
    const bool counts = static_cast<int>(number) > last && (is_folder || !patterns_[number].folders_only);
    return counts && (segment.any_folders || segment.name.Matches(name));
  };
  const bool may_match = others_begin_.test(first);
  for (auto number = others_.rbegin(); may_match && number != others_.rend(); ++number) {
    if (static_cast<int>(*number) <= last) break;
    if (matches(*number, patterns_[*number].segments.front())) last = static_cast<int>(*number);
  }
  for (const auto& [pattern, segment] : state.waiting) {
    const std::vector<Segment>& segments = patterns_[pattern].segments;
    if (segment + 1 == segments.size() && matches(pattern, segments[segment])) last = static_cast<int>(pattern);
  }
  return last;
}

}  // namespace base
