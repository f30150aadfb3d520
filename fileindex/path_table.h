#pragma once

#include <algorithm>
#include <cstddef>
#include <cstdint>
#include <functional>
#include <optional>
#include <string>
#include <string_view>
#include <unordered_map>
#include <utility>
#include <vector>

namespace ferrox::fileindex {

/// Values by full path, found from any path at or below theirs. A tree of names: each name of a path is hashed and
/// compared once, so that a path costs what its bytes cost, however deep it is and however many of the folders above it
/// have values.
template <typename Value, typename NameHash = std::hash<std::string_view>>
class PathTable {
 public:
  PathTable() = default;
  PathTable(PathTable&&) noexcept = default;
  PathTable& operator=(PathTable&&) noexcept = default;

  /// Keeps the value that is there already.
  void Insert(std::string_view full_path, Value value) {
    Node* node = nullptr;
    for (Names names(full_path); names.Next();) node = ChildOf(node, names.name);
    if (node->value) return;
    node->value.emplace(std::move(value));
    ++size_;
  }
  void Erase(std::string_view full_path) {
    const auto [node, is_whole] = Deepest(full_path);
    if (is_whole && node->value) Drop(node);
  }
  template <typename Predicate>
  void EraseIf(const Predicate& predicate) {
    std::vector<Node*> dropped;
    for (auto& [key, node] : nodes_) {
      if (node.value && predicate(*node.value)) dropped.push_back(&node);
    }
    for (Node* node : dropped) Drop(node);
  }

  size_t Size() const { return size_; }

  /// The value of exactly that path, null when it has none.
  const Value* Find(std::string_view full_path) const {
    const auto [node, is_whole] = Deepest(full_path);
    return is_whole && node->value ? &*node->value : nullptr;
  }

  bool HasAtOrAbove(std::string_view path) const {
    bool has = false;
    VisitUpwards(path, [&has](const Value&) { return has = true; });
    return has;
  }
  bool HasBelow(std::string_view path) const {
    const auto [node, is_whole] = Deepest(path);
    return is_whole && node->children > 0;
  }

  /// Calls `visit` for the value at `path`, then for those above it, the deepest first, until it returns true.
  /// A value's path E lies at or above P when P + "/" begins with E + "/": E is P cut at one of its slashes.
  template <typename Visit>
  void VisitUpwards(std::string_view path, const Visit& visit) const {
    for (const Node* node = Deepest(path).first; node != nullptr; node = node->key->parent) {
      if (node->value && visit(*node->value)) return;
    }
  }

 private:
  struct Node;
  struct Key {
    Node* parent;
    std::string name;
  };
  /// What was looked for, without a copy of the name.
  struct KeyView {
    const Node* parent;
    std::string_view name;
  };
  struct Node {
    const Key* key = nullptr;  // the table's own, which stays where it is
    size_t children = 0;
    std::optional<Value> value;
  };
  /// Not noexcept: the table then keeps the hashes, and does not ask again.
  struct Hash {
    using is_transparent = void;
    template <typename AnyKey>
    size_t operator()(const AnyKey& key) const {
      const auto parent = static_cast<uint64_t>(reinterpret_cast<uintptr_t>(key.parent)) * 0x9E3779B97F4A7C15U;
      return NameHash()(key.name) ^ static_cast<size_t>(parent >> 16U);
    }
  };
  struct Equal {
    using is_transparent = void;
    template <typename A, typename B>
    bool operator()(const A& a, const B& b) const {
      return a.parent == b.parent && a.name == b.name;
    }
  };

  /// What stands between the slashes of a path, in front of the first and behind the last, also where it is nothing.
  struct Names {
    explicit Names(std::string_view path) : rest(path) {}
    bool Next() {
      if (is_at_end) return false;
      const size_t size = std::min(rest.find('/'), rest.size());
      is_at_end = size == rest.size();
      name = rest.substr(0, size);
      rest.remove_prefix(is_at_end ? size : size + 1);
      return true;
    }
    std::string_view rest;
    std::string_view name = {};
    bool is_at_end = false;
  };

  /// The node of the path or, while there is none, of the deepest folder above it; and whether it is the path's own.
  template <typename Table>
  static auto DeepestIn(Table& nodes, std::string_view path) {
    decltype(&nodes.begin()->second) node = nullptr;
    for (Names names(path); names.Next();) {
      const auto found = nodes.find(KeyView{node, names.name});
      if (found == nodes.end()) return std::pair(node, false);
      node = &found->second;
    }
    return std::pair(node, true);
  }
  auto Deepest(std::string_view path) const { return DeepestIn(nodes_, path); }
  auto Deepest(std::string_view path) { return DeepestIn(nodes_, path); }

  Node* ChildOf(Node* parent, std::string_view name) {
    if (const auto found = nodes_.find(KeyView{parent, name}); found != nodes_.end()) return &found->second;
    const auto added = nodes_.try_emplace(Key{parent, std::string(name)}).first;
    added->second.key = &added->first;
    if (parent != nullptr) ++parent->children;
    return &added->second;
  }

  /// Takes the value away, and each node that then leads to none.
  void Drop(Node* node) {
    --size_;
    node->value.reset();
    while (node != nullptr && !node->value && node->children == 0) {
      Node* parent = node->key->parent;
      nodes_.erase(nodes_.find(*node->key));
      if (parent != nullptr) --parent->children;
      node = parent;
    }
  }

  std::unordered_map<Key, Node, Hash, Equal> nodes_;
  size_t size_ = 0;  // nodes with values
};

}  // namespace ferrox::fileindex
