#pragma once

#include <sys/stat.h>

#include <cstdint>
#include <functional>
#include <memory>
#include <string>
#include <string_view>
#include <vector>

#include "services/fileindexd/share_folders.h"
#include "services/support/exclusions.h"

namespace ferrox::indexd {

/// What a walk leaves out, and where it reports problems. The functions are called by the walking thread.
struct WalkRules {
  /// What a path is for the walk: entries outside are left out, with what is below; a folder on the way is entered, but
  /// not returned. Not asked below an indexed folder, where all is indexed that no pattern leaves out.
  std::function<ShareFolders::Place(const std::string& path)> place_of = [](const std::string&) {
    return ShareFolders::Place::kIndexed;
  };
  /// Whether a name is never indexed, nor anything below it.
  std::function<bool(const std::string& name)> skip_name = [](const std::string&) { return false; };
  /// What patterns leave out in an indexed folder, which is not looked at; null: nothing. `may_have_file` is false
  /// where the folder holds no ignore file. Folders that are left out are asked about by place_of once more.
  std::function<services::Exclusions::FolderPtr(const std::string& folder, bool may_have_file)> exclusions_in =
      [](const std::string&, bool) { return nullptr; };
  /// Whether a folder found below one on the device `parent_device` may be entered; asked at each look at the folder.
  std::function<bool(const std::string& path, const struct stat& status, dev_t parent_device)> may_enter =
      [](const std::string&, const struct stat&, dev_t) { return true; };
  /// Called for what could not be read, with errno's value.
  std::function<void(const std::string& path, int error)> on_problem = [](const std::string&, int) {};
};

/// Walks a folder in the order in which the index lists the folders in it: first what is directly in a folder, by the
/// bytes of names, then what is in its subfolders, which are sorted as if their names ended in "/". Links are not
/// followed and not returned. Holds an open descriptor and the names of one folder for each level of the tree.
class TreeWalk {
 public:
  struct Entry {
    enum class Kind {
      kEntered,       ///< the folder `path` was read: its entries follow
      kFound,         ///< a file or folder, as `status` says
      kUnknown,       ///< the system could not examine `path`: nothing is known of it
      kUnknownBelow,  ///< the system could not read the folder `path`: nothing is known of what is in it
    };
    Kind kind = Kind::kFound;
    std::string path;
    struct stat status = {};
  };

  /// What lies below `folder`; the folder itself is entered, but not found. The rules must outlive the walk.
  TreeWalk(const std::string& folder, const WalkRules& rules);
  TreeWalk(const TreeWalk&) = delete;
  TreeWalk& operator=(const TreeWalk&) = delete;
  ~TreeWalk();

  /// False at the end; `entry` is then as it was.
  bool Next(Entry& entry);

  /// Looks at all entries that Next would find directly in the folder that was just entered, in their order, and does
  /// not go on; problems are not reported. False when something could not be examined. `take` gets name and path.
  bool Examine(const std::function<void(std::string_view name, const std::string& path, const struct stat&)>& take);
  /// Goes on behind the entries of the folder that was just entered, of which Examine has seen all.
  void SkipEntries();

  /// Whether the folder itself could be read.
  bool Opened() const { return opened_; }
  uint64_t LinksSkipped() const { return links_skipped_; }

 private:
  using Place = ShareFolders::Place;
  struct Level;
  struct Item;
  Place PlaceIn(const Level& level, const std::string& path) const;
  /// Opens and reads a folder, which is walked next. True when it could not be read and `entry` says so.
  bool Descend(int parent_fd, const std::string& name, const std::string& path, bool indexed, Entry& entry);
  void ReadNames(Level& level);
  void DropExcluded(Level& level, bool has_ignore_file) const;
  /// True when `entry` is to be returned.
  bool Find(Level& level, const Item& item, Entry& entry);
  bool MayEnter(Level& level, std::string_view name, const std::string& path, const struct stat& status);

  const WalkRules& rules_;
  std::vector<std::unique_ptr<Level>> levels_;
  uint64_t links_skipped_ = 0;
  bool opened_ = false;
  std::unique_ptr<Entry> first_;
};

}  // namespace ferrox::indexd
