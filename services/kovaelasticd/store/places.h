#pragma once

#include <array>
#include <cstddef>
#include <cstdint>
#include <memory>
#include <string>
#include <string_view>
#include <vector>

#include "base/mutex.h"
#include "services/kovaelasticd/store/doc_set.h"
#include "services/kovaelasticd/store/sqlite_db.h"

namespace ferrox::engine {

/// Where a document or folder lies, who may read it, and how long its text is.
struct Place {
  static constexpr int64_t kAccessMax = (1 << 23) - 1;

  uint32_t folder = 0;       ///< that it lies in; 0: it is not there, or is the folder "/"
  uint32_t access : 23 = 0;  ///< the number of its access record; 0: it has none, or one beyond kAccessMax
  uint32_t unseen : 1 = 0;   ///< its name is one that the share does not show (NameMarks)
  uint32_t length : 8 = 0;   ///< LengthClass of its text
};
static_assert(sizeof(Place) == 8);

/// What stands for a name in PathKeys, and in the table "locations": FNV-1a of its bytes.
uint32_t NameHash(std::string_view name);
/// The same for the name of a folder, which ends with "/", made from that of its own document, which does not.
constexpr uint32_t FolderNameHash(uint32_t document_name) { return (document_name ^ uint32_t{'/'}) * 16777619U; }

/// Places by the number of their document or folder, in parts that copies share: a copy with a few other places costs
/// little.
class PlaceList {
 public:
  static constexpr size_t kPart = 1024;  ///< numbers in a part; stored, never changes
  struct Part {
    std::array<Place, kPart> places;
    std::array<uint32_t, kPart> names;  ///< NameHash of the last part of the path
  };

  Place At(size_t number) const {
    const Part* const part = PartAt(number / kPart);
    return part != nullptr ? part->places[number % kPart] : Place();
  }
  uint32_t NameAt(size_t number) const {
    const Part* const part = PartAt(number / kPart);
    return part != nullptr ? part->names[number % kPart] : 0;
  }
  /// Numbers are below that.
  size_t End() const { return parts_.size() * kPart; }
  size_t Parts() const { return parts_.size(); }
  /// Null where nothing is.
  const Part* PartAt(size_t part) const { return part < parts_.size() ? parts_[part].places.get() : nullptr; }
  /// The version of the index (Totals) that changed the part last; 0: none since the table was made.
  int64_t VersionOf(size_t part) const { return part < parts_.size() ? parts_[part].version : 0; }
  void Put(size_t part, int64_t version, std::shared_ptr<const Part> places);

 private:
  struct Shared {
    std::shared_ptr<const Part> places;
    int64_t version = 0;
  };
  std::vector<Shared> parts_;
};

/// As the table "locations" has a part (docs/formats/engine.md): seven or eight bytes for a document.
std::string PackPlaces(const PlaceList::Part& part);
/// False when the bytes are not what PackPlaces writes.
bool UnpackPlaces(std::string_view packed, PlaceList::Part& part);

/// A number for the path of each folder, which depends on nothing but the path. Made when somebody first asks.
class FolderKeys {
 public:
  /// By folder; those of `folders`, which must be the same at each call. 0 for what does not hang on the tree.
  const std::vector<uint64_t>& Of(const PlaceList& folders);

 private:
  base::Mutex mutex_;
  bool made_ BASE_GUARDED_BY(mutex_) = false;
  std::vector<uint64_t> keys_;  ///< never changes once made_
};

/// Where all documents and folders of an index lie, as of one commit: 12 bytes each. Searches have it instead of the
/// rows when they ask for the part of the tree that many documents lie in, and for what a user may read. Never changes,
/// so any thread may read it.
class Places {
 public:
  /// Reads those of the database's snapshot, whose version (Totals) is `version`. With `before`, of an earlier version,
  /// only what has changed since is read. @throws Error kEngineStorage.
  static std::shared_ptr<const Places> Load(Database& database, int64_t version, const Places* before);

  int64_t Version() const { return version_; }
  const PlaceList& Documents() const { return documents_; }
  const PlaceList& Folders() const { return folders_; }
  /// FolderKeys of Folders.
  const std::vector<uint64_t>& Keys() const { return folder_keys_->Of(folders_); }

 private:
  int64_t version_ = -1;
  PlaceList documents_;
  PlaceList folders_;
  std::shared_ptr<FolderKeys> folder_keys_;  ///< shared with other versions that have the same folders
};

/// A number for the path of each document, which depends on nothing but the path: for an order among documents that
/// their numbers, and so other documents, must not decide. Two paths may have the same one, but hardly ever do.
class PathKeys {
 public:
  /// `places` must outlive this.
  explicit PathKeys(const Places& places) : documents_(places.Documents()), folder_keys_(places.Keys()) {}
  uint64_t Of(int64_t document) const;

 private:
  const PlaceList& documents_;
  const std::vector<uint64_t>& folder_keys_;
};

/// The folders at and below some. Whether a folder is among them is found by the way up from it, once for each folder
/// on that way: so a search of many documents costs little more than one step for each, in whatever order folders were
/// made and moved. What does not hang on the tree is below nothing.
class FoldersBelow {
 public:
  /// `places` must outlive this. Below FolderTree::kNone is nothing.
  FoldersBelow(const Places& places, const std::vector<int64_t>& tops);
  bool Contains(uint32_t folder);

 private:
  enum class Known : uint8_t { kNo, kInside, kOutside };

  const PlaceList& folders_;
  std::vector<Known> known_;
  std::vector<uint32_t> way_;
};

}  // namespace ferrox::engine
