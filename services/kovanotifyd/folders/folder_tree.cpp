#include "services/kovanotifyd/folders/folder_tree.h"

#include <algorithm>
#include <cstring>
#include <utility>

namespace ferrox::notifyd {

namespace {

constexpr size_t kFewestSlots = 64;

uint32_t Mix(uint64_t value) {
  value ^= value >> 32;
  value *= 0x9E3779B97F4A7C15U;
  return static_cast<uint32_t>(value >> 32);
}

}  // namespace

IdTable::IdTable(Hash hash) : hash_(std::move(hash)), slots_(kFewestSlots, kEmpty) {}

void IdTable::Insert(uint32_t id) {
  if ((used_ + 1) * 4 > slots_.size() * 3) Rebuild();
  size_t at = hash_(id) & Mask();
  while (slots_[at] != kEmpty) at = (at + 1) & Mask();
  slots_[at] = id;
  ++used_;
  ++live_;
}

void IdTable::Erase(uint32_t id) {
  size_t at = hash_(id) & Mask();
  while (slots_[at] != id) at = (at + 1) & Mask();
  slots_[at] = kErased;
  --live_;
}

/// Drops the erased slots; afterwards the table is between a quarter and half full.
void IdTable::Rebuild() {
  size_t size = kFewestSlots;
  while (size < (live_ + 1) * 2) size *= 2;
  const std::vector<uint32_t> old = std::exchange(slots_, std::vector<uint32_t>(size, kEmpty));
  used_ = live_ = 0;
  for (const uint32_t id : old) {
    if (id != kEmpty && id != kErased) Insert(id);
  }
}

FolderTree::FolderTree()
    : by_place_([this](uint32_t id) { return PlaceHash(nodes_[id].parent, Name(id)); }),
      by_key_([this](uint32_t id) { return KeyHash(nodes_[id].key); }) {
  SetName(nodes_[Allocate()], "");
}

uint32_t FolderTree::PlaceHash(Id parent, std::string_view name) const {
  return Mix(std::hash<std::string_view>()(name) + parent * uint64_t{0xD6E8FEB86659FD93U});
}

uint32_t FolderTree::KeyHash(FolderKey key) const { return Mix(key); }

FolderTree::Id FolderTree::Allocate() {
  Id id = free_;
  if (id == kNone) {
    id = static_cast<Id>(nodes_.size());
    nodes_.emplace_back();
  } else {
    free_ = nodes_[id].parent;
  }
  const auto serial = static_cast<uint16_t>(nodes_[id].serial + 1);
  nodes_[id] = Node();
  nodes_[id].serial = serial;
  return id;
}

void FolderTree::SetName(Node& node, std::string_view name) {
  node.name.reset(new char[name.size()]);
  std::copy(name.begin(), name.end(), node.name.get());
  node.name_size = static_cast<uint16_t>(name.size());
}

void FolderTree::Link(Id id, Id parent) {
  Node& node = nodes_[id];
  node.parent = parent;
  node.previous = kNone;
  node.next = nodes_[parent].first_child;
  if (node.next != kNone) nodes_[node.next].previous = id;
  nodes_[parent].first_child = id;
  by_place_.Insert(id);
}

void FolderTree::Unlink(Id id) {
  by_place_.Erase(id);
  const Node& node = nodes_[id];
  (node.previous == kNone ? nodes_[node.parent].first_child : nodes_[node.previous].next) = node.next;
  if (node.next != kNone) nodes_[node.next].previous = node.previous;
}

FolderTree::Id FolderTree::Child(Id parent, std::string_view name) const {
  return by_place_.Find(PlaceHash(parent, name), [&](uint32_t id) {
    const Node& node = nodes_[id];
    return node.parent == parent && node.name_size == name.size() &&
           memcmp(node.name.get(), name.data(), name.size()) == 0;
  });
}

FolderTree::Id FolderTree::Add(Id parent, std::string_view name) {
  const Id id = Allocate();
  SetName(nodes_[id], name);
  Link(id, parent);
  return id;
}

FolderTree::Id FolderTree::FindOrAdd(std::string_view path) {
  Id id = kTop;
  for (size_t at = 0; at < path.size();) {
    const size_t end = std::min(path.find('/', at), path.size());
    if (end > at) {
      const std::string_view name = path.substr(at, end - at);
      const Id child = Child(id, name);
      id = child == kNone ? Add(id, name) : child;
    }
    at = end + 1;
  }
  return id;
}

void FolderTree::Move(Id id, Id parent, std::string_view name) {
  ++changes_;
  Unlink(id);
  SetName(nodes_[id], name);
  Link(id, parent);
}

void FolderTree::Remove(Id id, const std::function<void(Id)>& before) {
  for (Id at = id;;) {
    while (nodes_[at].first_child != kNone) at = nodes_[at].first_child;
    before(at);
    const Id parent = nodes_[at].parent;
    SetKey(at, 0);
    Unlink(at);
    Node& node = nodes_[at];
    node.name.reset();
    ++node.serial;
    node.parent = std::exchange(free_, at);
    if (at == id) return;
    at = parent;
  }
}

FolderTree::Id FolderTree::ByKey(FolderKey key) const {
  if (key == 0) return kNone;
  return by_key_.Find(KeyHash(key), [&](uint32_t id) { return nodes_[id].key == key; });
}

void FolderTree::SetKey(Id id, FolderKey key) {
  ++changes_;
  if (nodes_[id].key != 0) {
    by_key_.Erase(id);
    --keys_;
  }
  nodes_[id].key = key;
  if (key != 0) {
    by_key_.Insert(id);
    ++keys_;
  }
}

std::string FolderTree::Path(Id id) const {
  if (id == kTop) return "/";
  size_t size = 0;
  for (Id at = id; at != kTop; at = nodes_[at].parent) size += nodes_[at].name_size + 1U;
  std::string path(size, '/');
  for (Id at = id; at != kTop; at = nodes_[at].parent) {
    size -= nodes_[at].name_size;
    Name(at).copy(path.data() + size, nodes_[at].name_size);
    --size;
  }
  return path;
}

std::string FolderTree::Path(Id id, std::string_view name) const {
  std::string path = Path(id);
  if (id != kTop) path += '/';
  return path.append(name);
}

bool FolderTree::IsWithin(Id id, Id top) const {
  while (id != top && id != kTop) id = nodes_[id].parent;
  return id == top;
}

bool FolderTree::HasAtOrAbove(Id id, Flag flag) const {
  while (id != kTop && !Has(id, flag)) id = nodes_[id].parent;
  return Has(id, flag);
}

uint64_t FolderTree::CountKeys(Id top) const {
  uint64_t keys = 0;
  for (Id at = top; at != kNone;) {
    if (nodes_[at].key != 0) ++keys;
    if (nodes_[at].first_child != kNone) {
      at = nodes_[at].first_child;
      continue;
    }
    while (at != top && nodes_[at].next == kNone) at = nodes_[at].parent;
    at = at == top ? kNone : nodes_[at].next;
  }
  return keys;
}

std::vector<FolderTree::Ref> FolderTree::Children(Id id) const {
  std::vector<Ref> children;
  for (Id at = nodes_[id].first_child; at != kNone; at = nodes_[at].next) children.push_back(RefOf(at));
  return children;
}

void FolderTree::Set(Id id, Flag flag, bool on) {
  uint8_t& flags = nodes_[id].flags;
  flags = static_cast<uint8_t>(on ? flags | flag : flags & ~flag);
}

FolderTree::Id FolderTree::Get(Ref ref) const {
  const bool there = ref.id < nodes_.size() && nodes_[ref.id].serial == ref.serial && ref.serial % 2 == 1;
  return there ? ref.id : kNone;
}

}  // namespace ferrox::notifyd
