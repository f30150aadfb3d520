// Catches folders located where they are now instead of where they were at the moment of a record.
#include "services/kovanotifyd/filesystem/folder_locator.h"

#include <deque>
#include <iterator>
#include <map>
#include <random>
#include <string>
#include <utility>
#include <vector>

#include <gtest/gtest.h>

#include "services/kovanotifyd/filesystem/rename_history.h"

namespace ferrox::notifyd {
namespace {

/// A file system of folders and the kernel's queue of what is done to it, which goes on while it is looked at.
class BusyFileSystem : public FolderSource {
 public:
  explicit BusyFileSystem(unsigned seed) : random_(seed) { folders_["top"] = {"", ""}; }

  Answer ReadPlace(const HandleKey& folder, FolderPlace& place) override {
    DoSomething();
    if (folder == "top") return Answer::kTop;
    if (folders_.count(folder) == 0) return Answer::kNowhere;
    place.parent = folders_[folder].parent;
    DoSomething();  // the answer may be made of two states
    if (folders_.count(folder) == 0) return Answer::kNowhere;
    place.name = folders_[folder].name;
    DoSomething();
    return Answer::kPlace;
  }

  void Drain(RecordWindow& window) override {
    FanBatch batch;
    batch.records = std::exchange(queued_, {});
    window.Add(std::move(batch));
    DoSomething();
  }

  void DoSomething() {
    for (int count = Below(4); count > 0 && left_ > 0; --count, --left_) Do();
  }

  const std::string& NextExpected() { return expected_[at_++]; }
  bool IsDone() const { return left_ == 0 && at_ == expected_.size(); }

 private:
  int Below(int bound) { return static_cast<int>(random_() % static_cast<unsigned>(bound)); }

  std::string PathOf(HandleKey folder) const {
    std::string path;
    for (; folder != "top"; folder = folders_.at(folder).parent) path.insert(0, "/" + folders_.at(folder).name);
    return path;
  }

  HandleKey Any() { return std::next(folders_.begin(), Below(static_cast<int>(folders_.size())))->first; }

  bool IsBelow(HandleKey folder, const HandleKey& above) const {
    for (; folder != "top"; folder = folders_.at(folder).parent) {
      if (folder == above) return true;
    }
    return false;
  }

  const HandleKey* At(const FolderPlace& place) const {
    for (const auto& [key, at] : folders_) {
      if (at.parent == place.parent && at.name == place.name) return &key;
    }
    return nullptr;
  }

  void Queue(FanRecord record) {
    expected_.push_back(PathOf(record.folder));
    queued_.push_back(std::move(record));
  }

  std::string_view Keep(const std::string& name) { return names_.emplace_back(name); }

  void Do() {
    const HandleKey folder = Any();
    const int what = Below(10);
    if (what < 3) return Queue({FAN_MODIFY, 0, folder, "file"});
    const FolderPlace place = {folder, std::string(1, static_cast<char>('a' + Below(6)))};
    if (what < 5) {
      if (At(place) != nullptr) return;
      const HandleKey made = "k" + std::to_string(next_++);
      folders_[made] = place;
      return Queue({FAN_CREATE | FAN_ONDIR, 0, folder, Keep(place.name), "", "", made});
    }
    const HandleKey target = Any();
    if (target == "top") return;
    const FolderPlace old = folders_[target];
    if (what < 6) {
      for (const auto& [key, at] : folders_) {
        if (at.parent == target) return;
      }
      folders_.erase(target);
      expected_.push_back(PathOf(old.parent));
      return queued_.push_back({FAN_DELETE | FAN_ONDIR, 0, old.parent, Keep(old.name), "", "", target});
    }
    if (IsBelow(folder, target) || At(place) != nullptr) return;
    expected_.push_back(PathOf(old.parent));
    folders_[target] = place;
    queued_.push_back({FAN_RENAME | FAN_ONDIR, 0, old.parent, Keep(old.name), folder, Keep(place.name), target});
  }

  std::mt19937 random_;
  std::map<HandleKey, FolderPlace> folders_;
  std::deque<std::string> names_;
  std::vector<FanRecord> queued_;
  std::vector<std::string> expected_;
  size_t at_ = 0;
  int next_ = 0;
  int left_ = 2000;
};

std::string PathOf(const FolderCache::Folder& folder) {
  return folder.parent == nullptr ? "" : PathOf(*folder.parent) + "/" + folder.name;
}

TEST(FolderLocatorTest, PathsAreThoseOfTheMomentHoweverFarTheReaderIsBehind) {
  for (unsigned seed = 0; seed < 24; ++seed) {
    SCOPED_TRACE("seed " + std::to_string(seed));
    BusyFileSystem disk(seed);
    FolderCache cache(1 + seed % 20);
    RecordWindow window;
    FolderLocator locator(cache, window, disk);
    while (!disk.IsDone()) {
      disk.DoSomething();
      if (seed % 3 == 0 || window.IsEmpty()) disk.Drain(window);
      if (window.IsEmpty()) continue;
      const FanRecord& record = window.Front();
      const FolderCache::Folder* folder = locator.Locate(record.folder);
      ASSERT_NE(folder, nullptr);
      ASSERT_EQ(PathOf(*folder), disk.NextExpected());
      const bool is_rename = (record.mask & FAN_RENAME) != 0;
      if (is_rename || (record.mask & FAN_CREATE) != 0) {
        const FolderPlace place = {is_rename ? record.new_folder : record.folder,
                                   std::string(is_rename ? record.new_name : record.name)};
        ASSERT_NE(locator.Place(record.target, place), nullptr);
      }
      window.Pop();
    }
  }
}

TEST(FolderCacheTest, KeepsWhatIsInUseAndNoLoops) {
  FolderCache cache(10);
  FolderCache::Folder* top = cache.Put("top", nullptr, "");
  FolderCache::Folder* used = cache.Put("used", top, "u");
  for (int i = 0; i < 100; ++i) {
    (void)cache.Put("x" + std::to_string(i), used, "x");
    ASSERT_EQ(cache.Find("used"), used);
    ASSERT_LE(cache.Size(), 11U);
  }
  EXPECT_EQ(cache.Find("x0"), nullptr);
  EXPECT_EQ(PathOf(*cache.Find("x99")), "/u/x");
  EXPECT_EQ(cache.Put("top", cache.Find("x99"), "loop"), nullptr);
  EXPECT_EQ(PathOf(*cache.Find("x99")), "/u/x");
}

TEST(RenameHistoryTest, DoubtsOnlyWhatComesBack) {
  const FanRecord there = {FAN_RENAME, 0, "f", "a", "f", "b", "x"};
  const FanRecord back = {FAN_RENAME, 0, "f", "b", "f", "a", "x"};
  const FanRecord other = {FAN_RENAME, 0, "f", "c", "f", "a", "y"};
  RenameHistory history;
  history.Note(there);
  history.Note(other);
  EXPECT_FALSE(history.HasLoops());
  history.Note(back);
  const auto loops = history.Loops();
  ASSERT_EQ(loops.size(), 1U);
  EXPECT_EQ(loops.at("x").size(), 2U);
  history.Clear();
  history.Note(back);
  EXPECT_FALSE(history.HasLoops());
}

}  // namespace
}  // namespace ferrox::notifyd
