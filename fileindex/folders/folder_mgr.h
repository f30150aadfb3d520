#pragma once

#include <memory>
#include <set>
#include <string>
#include <vector>

#include "common/export.h"
#include "fileindex/folders/folder.h"

namespace ferrox::fileindex {

struct FolderLookup;

/// At most so many folders are indexed.
inline constexpr unsigned int kFileIndexFoldersMax = 1000;

/// The list of indexed folders, as the folders file holds it (docs/formats/folders.md). Made per use: it reads the file
/// when made; changes are in memory until Save. Takes no lock: who changes the list holds the folder lock from before
/// the making until after Save. Not for several threads at once, but after a first query by full path further ones may
/// come from several.
///
/// An entry whose share does not exist, or whose path does not begin with "/", governs nothing; it can be listed and
/// deleted, and is named in the log once for each object. Queries by full path, the first one of an object asking the
/// platform for each share, throw kNoSuchShare when the platform cannot tell: "not indexed" means just that.
///
/// A "change" is a Folder with the path and name of the entry concerned and the kinds set whose indexing changed.
class FERROX_EXPORT FolderMgr {
 public:
  /// Loads the file; a missing one is an empty list. @throws Error kLoadFailed when it holds no JSON array;
  /// kBadArgument when an element is no folder.
  FolderMgr();
  ~FolderMgr();
  FolderMgr(const FolderMgr&) = delete;
  FolderMgr& operator=(const FolderMgr&) = delete;

  /// Writes the file as "root", the old one or the new one at any moment, and makes it world-readable.
  /// @throws Error kSaveFailed; kInternal when the mode cannot be set; kCredentialsFailed.
  void Save() const;

  /// The entries in the file's order, new ones last. Their flags and paths may be changed before Save; queries by full
  /// path then still see the paths of before.
  const std::vector<std::shared_ptr<Folder>>& GetFolders() const { return folders_; }

  /// The entry of exactly that share path. @throws Error kNoSuchFolder.
  void Get(std::shared_ptr<Folder>& out, const std::string& path) const;
  bool HasFolder(const std::string& path) const;

  /// Adds an entry, or replaces the one of the same path (which then stands last). @throws Error kNoSuchShare, with
  /// nothing changed; kTooManyFolders with the entry added: do not save then.
  void Upsert(std::shared_ptr<Folder>& change, std::shared_ptr<Folder> folder);
  /// Removes all entries of exactly that path. @throws Error kNoSuchFolder when there is none, with nothing changed.
  void Delete(std::shared_ptr<Folder>& change, const std::string& path);
  /// Removes every entry of the share.
  void DeleteByShare(const std::string& share);

  /// One page of the entries, sorted by "path", or by "document", "audio", "video" or "photo" (those with the flag
  /// first); equal ones, and all for another key, in the file's order. "desc" reverses the whole list. `total` is the
  /// number of all entries; an offset past the end, or a limit of 0, gives an empty page.
  void List(std::vector<std::shared_ptr<Folder>>& out, unsigned int& total, unsigned int offset, unsigned int limit,
            const std::string& sort_by, const std::string& sort_direction) const;

  /// The entry that governs a full path: the deepest one at or above it, null when there is none.
  std::shared_ptr<Folder> GetMostSuitableCfg(const std::string& full_path) const;
  /// The kinds in which `a` differs from `b`, all of them when `b` is null. `a` is not null.
  static std::shared_ptr<Folder> DiffCfg(std::shared_ptr<Folder> a, std::shared_ptr<Folder> b);

  /// Whether an entry lies at or above the path.
  bool IsFullPathIndexed(const std::string& full_path) const;
  /// Whether the path is an entry's own.
  bool IsFullPathHasOwnCfg(const std::string& full_path) const;
  /// Whether the content of the file at `full_path` is indexed: by its kind, under the entry that governs it.
  bool IsFullPathNeedMeta(const std::string& full_path) const;
  bool IsShareIndexed(const std::string& share) const;
  /// The shares of all entries, each once, in ascending order.
  std::set<std::string> GetIndexedShares() const;

 private:
  /// Where the entries lie, looked up when a full path is first asked about and kept up to date by the changes below.
  FolderLookup& ByFullPath() const;
  /// Removes all entries of the share path `path`; an entry of another share at the same full path takes its place.
  void Remove(const std::string& path, const std::string& full_path);

  std::vector<std::shared_ptr<Folder>> folders_;
  mutable std::unique_ptr<FolderLookup> lookup_;
};

}  // namespace ferrox::fileindex
