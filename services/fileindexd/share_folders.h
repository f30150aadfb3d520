#pragma once

#include <cstddef>
#include <map>
#include <set>
#include <string>
#include <string_view>
#include <utility>
#include <vector>

#include <json/forwards.h>

#include "base/path_table.h"
#include "fileindex/folders/folder_rule.h"
#include "services/support/exclusions.h"

namespace ferrox::fileindex {
class FolderMgr;
}

namespace ferrox::indexd {

/// The indexed folders of one share as they were configured at one moment. They decide, whatever the disk holds, which
/// paths have a document and of which files the content is read, by the library's rule
/// (fileindex/folders/folder_rule.h) over the share's own folders. Another share that lies in this one and is indexed
/// itself owns all in its folder: none of that counts here, whatever folder of this share lies above or in it. Whether
/// the share has a recycle bin, which is not indexed, is part of the configuration; so are the patterns that leave
/// files out, which are applied elsewhere (services/support/exclusions.h). Safe for several threads once it is loaded.
class ShareFolders {
 public:
  enum class Place {
    kOutside,   ///< under no folder, or in an indexed share that lies in this one
    kOnTheWay,  ///< under no folder, but one lies below
    kIndexed,   ///< a folder, or under one
  };

  /// The patterns for all folders (services::ExclusionRules).
  using InstancePatterns = std::vector<std::pair<std::string, base::PatternLists>>;

  /// No folders.
  ShareFolders() = default;
  /// The folders of `share`, whose own folder is `root`, as the folders file holds them now.
  /// @throws Error kLoadFailed; kBadArgument; kNoSuchShare; kInternal.
  static ShareFolders Load(const std::string& share, const std::string& root, const InstancePatterns& patterns = {});
  /// Back from ToJson. @throws Error kBadArgument for anything else.
  static ShareFolders FromJson(const Json::Value& stored);
  /// An object with a member for each folder, by its full path: an object of the kinds; and "inner", the folders of
  /// the shares that lie in this one; and "exclusions", the patterns. Nothing else is kept.
  Json::Value ToJson() const;

  /// Whether the same is indexed, paused or not.
  bool operator==(const ShareFolders& other) const {
    return kinds_ == other.kinds_ && SameInner(other) && recycle_bin_ == other.recycle_bin_ && SameExclusions(other);
  }
  size_t Count() const { return kinds_.size(); }
  bool AnyPaused() const { return any_paused_; }

  Place PlaceOf(std::string_view full_path) const;
  /// Whether a folder lies below the path.
  bool HasBelow(std::string_view full_path) const;
  /// The indexed shares that lie in this one: their names, by their folders.
  const std::map<std::string, std::string, std::less<>>& Inner() const { return inner_; }
  /// Whether one that lay in this one `before` is named by folders still, but by the share table no longer: it is being
  /// renamed, and the table has its new name before the folders do.
  bool MissInnerOf(const ShareFolders& before) const;
  /// Whether the path is, or lies in, the folder of one of them.
  bool IsInInner(std::string_view full_path) const;
  /// Whether the content of a file there is read: its kind is on, or it is of none of the four kinds.
  bool WantsContent(const std::string& full_path) const;
  /// What is indexed of all at and below a path: itself, or the folders below it that lie in no other.
  std::vector<std::string> Topmost(const std::string& full_path) const;
  const services::ExclusionRules& Exclusions() const { return exclusions_; }
  /// The folders, and those of inner shares, that only one of the two has, and the folders whose kinds or patterns
  /// differ.
  std::vector<std::string> DifferingFrom(const ShareFolders& other) const;
  /// Whether all that differs is what no event tells of: the inner shares and the patterns.
  bool DiffersWithoutEvent(const ShareFolders& other) const {
    return kinds_ == other.kinds_ && !(SameInner(other) && SameExclusions(other));
  }

 private:
  using Kinds = fileindex::ContentKinds;

  void Add(const std::string& full_path, const Kinds& kinds);
  void LoadInner(const std::string& root, const fileindex::FolderMgr& folder_mgr);
  void AddInner(const std::string& full_path, const std::string& share);
  bool SameInner(const ShareFolders& other) const;
  bool SameExclusions(const ShareFolders& other) const;
  bool SamePatterns(const ShareFolders& other, const std::string& folder) const;
  /// The kinds under which the path lies; null when it is under no folder.
  const Kinds* Governing(std::string_view full_path) const { return fileindex::Governing(by_full_path_, full_path); }

  bool any_paused_ = false;
  bool recycle_bin_ = false;
  std::map<std::string, Kinds, std::less<>> kinds_;        ///< by full path
  std::map<std::string, std::string, std::less<>> inner_;  ///< names of shares by full path
  std::set<std::string> missing_;        ///< the names of shares that have folders and are not in the share table
  services::ExclusionRules exclusions_;  ///< has each of the folders
  // The same two, to be found from the paths below.
  base::PathTable<Kinds> by_full_path_;
  base::PathTable<bool> inner_by_full_path_;
};

}  // namespace ferrox::indexd
