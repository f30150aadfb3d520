#pragma once

#include <cstdint>
#include <deque>
#include <functional>
#include <memory>
#include <string>
#include <string_view>
#include <vector>

namespace ferrox::notifyd {

/// The kernel's name for a watched folder, as a port gives it; 0 is none.
using FolderKey = uint64_t;

/// A hash set of numbers that stand for something else, such as indices into a vector: hash and equality are those of
/// what they stand for. Open addressing, 4 bytes a slot.
class IdTable {
 public:
  using Hash = std::function<uint32_t(uint32_t id)>;

  /// `hash` gives the hash of what an id stands for; it must stay the same while the id is in the table.
  explicit IdTable(Hash hash);

  /// The id for which `matches` holds, which must be one with this hash; kEmpty when there is none.
  template <typename Matches>
  uint32_t Find(uint32_t hash, Matches matches) const {
    for (size_t at = hash & Mask();; at = (at + 1) & Mask()) {
      if (slots_[at] == kEmpty) return kEmpty;
      if (slots_[at] != kErased && matches(slots_[at])) return slots_[at];
    }
  }
  /// The id must not be in the table yet.
  void Insert(uint32_t id);
  /// The id must be in the table.
  void Erase(uint32_t id);

 private:
  static constexpr uint32_t kEmpty = UINT32_MAX;
  static constexpr uint32_t kErased = UINT32_MAX - 1;

  size_t Mask() const { return slots_.size() - 1; }
  void Rebuild();

  Hash hash_;
  std::vector<uint32_t> slots_;  ///< their number is a power of two
  size_t used_ = 0;              ///< slots that are not kEmpty
  size_t live_ = 0;              ///< slots that are neither kEmpty nor kErased
};

/// A tree of folders, from "/" down, that are found by their place (parent and name) and by the kernel's key: those
/// that are watched, and those that lead to them. Moving or finding a folder costs the same however much is below it.
/// Takes about 100 bytes a folder, without its name. Ids are reused: what keeps one while others change the tree keeps
/// a Ref.
class FolderTree {
 public:
  using Id = uint32_t;
  static constexpr Id kNone = UINT32_MAX;
  static constexpr Id kTop = 0;

  /// Refers to a folder that may be removed meanwhile, and its id given to another one (Get).
  struct Ref {
    Id id = kNone;
    uint16_t serial = 0;
  };
  enum Flag : uint8_t {
    kRoot = 1,        ///< a root of the watcher
    kPassage = 2,     ///< has a root below it
    kUnreadable = 4,  ///< could not be opened; its permissions may change
    kMoved = 8,       ///< moved by a record since all of the kernel's records had been read
    kListed = 16,     ///< found on disk by the listing under way
  };

  FolderTree();
  FolderTree(const FolderTree&) = delete;
  FolderTree& operator=(const FolderTree&) = delete;

  /// The folder of that name in `parent`, or kNone.
  Id Child(Id parent, std::string_view name) const;
  /// Adds a folder without a key. The name must not be there yet.
  Id Add(Id parent, std::string_view name);
  /// The folder of an absolute path; what is missing of it is added.
  Id FindOrAdd(std::string_view path);
  /// To a place where nothing is, and which is not below the folder itself.
  void Move(Id id, Id parent, std::string_view name);
  /// Removes a folder and all below it, deepest first; `before` is called with each of them. Not for the top.
  void Remove(Id id, const std::function<void(Id)>& before);

  /// The folder with that key, or kNone; kNone also for 0.
  Id ByKey(FolderKey key) const;
  /// Sets a folder's key, 0 for none. The key must not be another folder's.
  void SetKey(Id id, FolderKey key);
  FolderKey Key(Id id) const { return nodes_[id].key; }
  /// How many folders have a key; and those at and below a folder, which takes a walk through them.
  uint64_t Keys() const { return keys_; }
  uint64_t CountKeys(Id top) const;
  /// Grows whenever a key is set or a folder is moved, that is, when CountKeys may change.
  uint64_t Changes() const { return changes_; }

  Id Parent(Id id) const { return nodes_[id].parent; }
  Id FirstChild(Id id) const { return nodes_[id].first_child; }
  Id NextSibling(Id id) const { return nodes_[id].next; }
  std::vector<Ref> Children(Id id) const;
  std::string_view Name(Id id) const { return {nodes_[id].name.get(), nodes_[id].name_size}; }
  /// The full path of a folder, or of a name in it.
  std::string Path(Id id) const;
  std::string Path(Id id, std::string_view name) const;
  /// Whether a folder is `top` or below it.
  bool IsWithin(Id id, Id top) const;

  bool Has(Id id, Flag flag) const { return (nodes_[id].flags & flag) != 0; }
  /// Whether the folder or one above it has the flag.
  bool HasAtOrAbove(Id id, Flag flag) const;
  /// Whether the folder is a root or below one.
  bool IsCovered(Id id) const { return HasAtOrAbove(id, kRoot); }
  /// Whether the folder is a root or above one.
  bool LeadsToRoot(Id id) const { return (nodes_[id].flags & (kRoot | kPassage)) != 0; }
  void Set(Id id, Flag flag, bool on);

  Ref RefOf(Id id) const { return {id, nodes_[id].serial}; }
  /// The folder, or kNone when it was removed.
  Id Get(Ref ref) const;

 private:
  /// A folder, or a free node. Siblings are linked both ways, so that a folder is unlinked without a search.
  struct Node {
    FolderKey key = 0;
    std::unique_ptr<char[]> name;
    Id parent = kNone;  ///< of a free node: the next free one
    Id first_child = kNone;
    Id next = kNone;
    Id previous = kNone;
    uint16_t name_size = 0;
    uint16_t serial = 0;  ///< odd while the node is in use
    uint8_t flags = 0;
  };

  uint32_t PlaceHash(Id parent, std::string_view name) const;
  uint32_t KeyHash(FolderKey key) const;
  void SetName(Node& node, std::string_view name);
  void Link(Id id, Id parent);
  void Unlink(Id id);
  Id Allocate();

  std::deque<Node> nodes_;  ///< by id
  Id free_ = kNone;         ///< the first free node
  uint64_t keys_ = 0;
  uint64_t changes_ = 1;
  IdTable by_place_;  ///< by parent and name
  IdTable by_key_;    ///< those with a key
};

constexpr FolderTree::Id kNoFolder = FolderTree::kNone;

}  // namespace ferrox::notifyd
