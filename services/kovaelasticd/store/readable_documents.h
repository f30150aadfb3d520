#pragma once

#include <cstddef>
#include <cstdint>
#include <memory>
#include <vector>

#include "services/kovaelasticd/store/asker.h"
#include "services/kovaelasticd/store/doc_set.h"
#include "services/kovaelasticd/store/folder_tree.h"
#include "services/kovaelasticd/store/places.h"
#include "services/kovaelasticd/store/sqlite_db.h"

namespace ferrox::engine {

/// The documents of one index that one user may read, as of one commit. A folder is open when its record lets the user
/// enter it, and all above it up to the share's root do, the root among them; what is above the root is not asked. A
/// document is readable when its folder is open and its own record lets the user read it. What has no record, lies
/// beside the root, hangs on a folder that was deleted, or on nothing, is closed. For an asker with rules for names,
/// which the places must be marked by, folders and documents below the root with such a name are closed, too. Never
/// changes once made.
class ReadableDocuments {
 public:
  /// Those of the snapshot that `database` has a transaction on and `places` is of; `tree` is the connection's. With
  /// `before`, of the same asker and of an earlier version, only what has changed since is looked at.
  /// @throws Error kEngineStorage.
  static std::shared_ptr<const ReadableDocuments> Make(Database& database, FolderTree& tree, const Places& places,
                                                       const Asker& asker, const ReadableDocuments* before);

  const DocSet& Documents() const { return documents_; }
  int64_t Version() const { return version_; }  ///< of the places
  size_t SizeBytes() const;

  // Sums of the documents. Lengths are those that stand for the classes of lengths that places have.
  int64_t Count() const { return sums_.documents; }
  int64_t WithContent() const { return sums_.with_content; }
  int64_t TextBytes() const { return sums_.text_bytes; }

 private:
  struct Sums {
    int64_t documents = 0;
    int64_t with_content = 0;
    int64_t text_bytes = 0;
  };

  void ReadRecords(Database& database, const Asker& asker);
  /// Whether other folders are open than before.
  bool OpenFolders(const PlaceList& folders, int64_t root);
  void ReadPart(const PlaceList& documents, size_t number);
  // The root's own document lies above it, and is counted in no part.
  void AddRootDocument(const PlaceList& documents);
  void RemoveRootDocument();

  bool IsUnseen(const Place& place) const { return by_names_ && place.unseen != 0; }
  bool Gives(const Place& place, uint8_t permission) const {
    return place.access < permissions_.size() && (permissions_[place.access] & permission) != 0;
  }
  bool IsOpen(uint32_t folder) const {
    return folder / 64 < open_.size() && (open_[folder / 64] >> (folder % 64) & 1) != 0;
  }

  int64_t version_ = -1;
  bool by_names_ = false;             ///< names are looked at
  std::vector<uint8_t> permissions_;  ///< by the number of the record; number 0 is none, and gives none
  int64_t root_document_ = -1;        ///< its own document; -1: there is none
  bool root_counts_ = false;          ///< it is readable
  std::vector<uint64_t> open_;        ///< a bit for each folder; never that of number 0
  DocSet documents_;
  Sums sums_;
  std::vector<Sums> parts_;  ///< of each part of the places
};

}  // namespace ferrox::engine
