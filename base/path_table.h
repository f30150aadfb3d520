#pragma once

#include <algorithm>
#include <cstddef>
#include <cstdint>
#include <functional>
#include <string>
#include <string_view>
#include <unordered_map>
#include <utility>
#include <vector>

namespace base {

/// Values by full path, found from any path at or below theirs: "which of these folders holds this file". Each name of
/// a path is hashed once: the hash of a path goes on from that of the folder above it, so that a path costs what its
/// bytes cost, however deep it is and however many values there are. Belongs to one thread at a time.
///
/// Paths are absolute and in their plain form. "" is above all of them; "/" is a name like others and above none.
template <typename Value, typename NameHash = std::hash<std::string_view>>
class PathTable {
 public:
  /// Adds a value; keeps the one that is at that path already.
  void Insert(std::string_view full_path, Value value) {
    longest_ = std::max(longest_, full_path.size());
    const KeyView key = KeyOf(full_path);
    if (values_.find(key) == values_.end()) {
      (void)values_.try_emplace(Key{std::string(full_path), key.hash}, std::move(value));
    }
  }
  /// Removes the value of exactly that path, if there is one.
  void Erase(std::string_view full_path) {
    const auto found = values_.find(KeyOf(full_path));
    if (found != values_.end()) values_.erase(found);
  }
  /// Removes each value for which `predicate` is true. Linear in the number of values.
  template <typename Predicate>
  void EraseIf(const Predicate& predicate) {
    (void)std::erase_if(values_, [&predicate](const auto& entry) { return predicate(entry.second); });
  }

  size_t Size() const { return values_.size(); }

  /// The value of exactly that path, null when it has none.
  const Value* Find(std::string_view full_path) const {
    const auto found = values_.find(KeyOf(full_path));
    return found != values_.end() ? &found->second : nullptr;
  }

  /// Whether the path, or a folder above it, has a value.
  bool HasAtOrAbove(std::string_view path) const {
    bool has = false;
    VisitUpwards(path, [&has](const Value&) { return has = true; });
    return has;
  }

  /// Calls `visit` for the value at `path`, then for those above it, the deepest first, until it returns true.
  /// A value's path E lies at or above P when P + "/" begins with E + "/": E is P cut at one of its slashes.
  template <typename Visit>
  void VisitUpwards(std::string_view path, const Visit& visit) const {
    std::vector<const Value*> met;
    for (Prefixes prefixes(path); prefixes.Next() && prefixes.size <= longest_;) {
      const auto found = values_.find(KeyView{path.substr(0, prefixes.size), prefixes.hash});
      if (found != values_.end()) met.push_back(&found->second);
    }
    for (auto value = met.rbegin(); value != met.rend(); ++value) {
      if (visit(**value)) return;
    }
  }

 private:
  struct Key {
    std::string path;
    uint64_t hash;
  };
  struct KeyView {
    std::string_view path;
    uint64_t hash;
  };
  struct Hash {
    using is_transparent = void;
    template <typename AnyKey>
    size_t operator()(const AnyKey& key) const noexcept {
      return static_cast<size_t>(key.hash);
    }
  };
  struct Equal {
    using is_transparent = void;
    template <typename A, typename B>
    bool operator()(const A& a, const B& b) const {
      return a.hash == b.hash && a.path == b.path;
    }
  };

  /// A path cut at each of its slashes, and whole, from the shortest on.
  struct Prefixes {
    explicit Prefixes(std::string_view whole) : path(whole) {}
    bool Next() {
      if (size == path.size()) return false;
      const size_t begin = size + 1;  // npos at first
      size = std::min(path.find('/', begin), path.size());
      hash = (hash ^ NameHash()(path.substr(begin, size - begin))) * 0x9E3779B97F4A7C15U;
      hash ^= hash >> 32U;
      return true;
    }
    std::string_view path;
    size_t size = std::string_view::npos;
    uint64_t hash = 0;
  };

  static KeyView KeyOf(std::string_view path) {
    Prefixes prefixes(path);
    while (prefixes.Next()) {
    }
    return {path, prefixes.hash};
  }

  std::unordered_map<Key, Value, Hash, Equal> values_;
  size_t longest_ = 0;  // no path is longer: spares a look for each deeper folder
};

}  // namespace base
