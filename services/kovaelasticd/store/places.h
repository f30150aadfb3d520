#pragma once

#include <array>
#include <cstddef>
#include <cstdint>
#include <memory>
#include <string>
#include <string_view>
#include <vector>

#include "services/kovaelasticd/store/doc_set.h"
#include "services/kovaelasticd/store/sqlite_db.h"

namespace ferrox::engine {

/// Where a document or folder lies, and the number of its access record.
struct Place {
  uint32_t folder = 0;  ///< that it lies in; 0: it is not there, or is the folder "/"
  uint32_t access = 0;  ///< 0: it has no record
};

/// Places by the number of their document or folder, in parts that copies share: a copy with a few other places costs
/// little.
class PlaceList {
 public:
  static constexpr size_t kPart = 1024;  ///< numbers in a part; stored, never changes
  using Part = std::array<Place, kPart>;

  Place At(size_t number) const {
    const size_t part = number / kPart;
    return part < parts_.size() && parts_[part] != nullptr ? (*parts_[part])[number % kPart] : Place();
  }
  /// Numbers are below that.
  size_t End() const { return parts_.size() * kPart; }
  void Put(size_t part, const Part& places);

 private:
  std::vector<std::shared_ptr<const Part>> parts_;
};

/// As the table "places" has a part: for each place up to the last that is there the difference of its folder, and of
/// its access, to the one before, as numbers of 7 bits a byte. Two or three bytes for a document.
std::string PackPlaces(const PlaceList::Part& part);
/// False when the bytes are not what PackPlaces writes.
bool UnpackPlaces(std::string_view packed, PlaceList::Part& part);

/// Where all documents and folders of an index lie, as of one commit: 8 bytes each. Searches have it instead of the
/// rows when they ask for the part of the tree that many documents lie in. Never changes, so any thread may read it.
class Places {
 public:
  /// Reads those of the database's snapshot, whose version (Totals) is `version`. With `before`, of an earlier version,
  /// only what has changed since is read. @throws Error kEngineStorage.
  static std::shared_ptr<const Places> Load(Database& database, int64_t version, const Places* before);

  int64_t Version() const { return version_; }
  const PlaceList& Documents() const { return documents_; }
  const PlaceList& Folders() const { return folders_; }

 private:
  int64_t version_ = -1;
  PlaceList documents_;
  PlaceList folders_;
};

/// The folders at and below one. Whether a folder is among them is found by the way up from it, once for each folder on
/// that way: so a search of many documents costs little more than one step for each, in whatever order folders were
/// made and moved. What does not hang on the tree is below nothing.
class FoldersBelow {
 public:
  /// `places` must outlive this. Below FolderTree::kNone is nothing.
  FoldersBelow(const Places& places, int64_t top);
  bool Contains(uint32_t folder);

 private:
  enum class Known : uint8_t { kNo, kInside, kOutside };

  const PlaceList& folders_;
  std::vector<Known> known_;
  std::vector<uint32_t> way_;
};

}  // namespace ferrox::engine
