#pragma once

#include <algorithm>
#include <functional>
#include <string>
#include <string_view>
#include <unordered_map>
#include <utility>

namespace ferrox::fileindex {

/// Values by full path, found from any path at or below theirs. A lookup costs a hash for each component of the path.
template <typename Value>
class PathTable {
 public:
  /// Keeps the value that is there already.
  void Insert(const std::string& full_path, Value value) {
    longest_ = std::max(longest_, full_path.size());
    (void)values_.try_emplace(full_path, std::move(value));
  }
  void Erase(const std::string& full_path) { (void)values_.erase(full_path); }
  template <typename Predicate>
  void EraseIf(const Predicate& predicate) {
    (void)std::erase_if(values_, [&predicate](const auto& entry) { return predicate(entry.second); });
  }

  size_t Size() const { return values_.size(); }

  /// The value of exactly that path, null when it has none.
  const Value* Find(std::string_view full_path) const {
    const auto found = values_.find(full_path);
    return found != values_.end() ? &found->second : nullptr;
  }

  /// Calls `visit` for the value at `path`, then for those above it, the deepest first, until it returns true.
  /// A value's path E lies at or above P when P + "/" begins with E + "/": E is P cut at one of its slashes.
  template <typename Visit>
  void VisitUpwards(std::string_view path, const Visit& visit) const {
    for (size_t end = path.size(); end != std::string_view::npos; end = SlashBefore(path, end)) {
      const Value* value = end <= longest_ ? Find(path.substr(0, end)) : nullptr;
      if (value != nullptr && visit(*value)) return;
    }
  }

 private:
  struct Hash : std::hash<std::string_view> {
    using is_transparent = void;
  };

  static size_t SlashBefore(std::string_view path, size_t end) {
    return end == 0 ? std::string_view::npos : path.rfind('/', end - 1);
  }

  std::unordered_map<std::string, Value, Hash, std::equal_to<>> values_;
  size_t longest_ = 0;  // no path is longer: spares the hashes of a deep path's lower components
};

}  // namespace ferrox::fileindex
