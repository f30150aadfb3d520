// Catches folders that are not watched, and changes told with a path that was not the one of the moment.
#include "services/kovanotifyd/folders/folder_watcher.h"

#include <fcntl.h>
#include <stdio.h>
#include <sys/mount.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <atomic>
#include <cstring>
#include <filesystem>
#include <fstream>
#include <functional>
#include <random>
#include <thread>

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include "services/kovanotifyd/folders/fan_inode_port.h"
#include "services/kovanotifyd/folders/inotify_port.h"
#include "tests/notifyd/random_changes.h"
#include "tests/notifyd/watcher_recorder.h"
#include "tests/support/temp_dir.h"

namespace ferrox::notifyd {
namespace {

namespace fs = std::filesystem;
using std::chrono::milliseconds;
using test::TempDir;
using test::WriteFile;
using testing::AllOf;
using testing::Contains;
using testing::ElementsAre;
using testing::HasSubstr;
using testing::IsEmpty;

class FolderWatcherTest : public testing::TestWithParam<const char*> {
 protected:
  void SetUp() override {
    fs::create_directory(root_);
    WriteFile(dir_ / "cookies/cookie", "");
    if (!IsInotify()) {
      FanGroup group;
      const std::string reason = group.Open();
      if (!reason.empty()) GTEST_SKIP() << reason;
      const int error = group.Mark(root_, FanGroup::Scope::kFolder, FAN_CREATE);
      if (error != 0) GTEST_SKIP() << FanGroup::Reason(error, FanGroup::Scope::kFolder);
    }
    MakeWatcher({dir_ / "cookies/cookie", 0});
  }

  bool IsInotify() const { return std::string(GetParam()) == "inotify"; }
  void MakeWatcher(const FolderWatcher::Options& options) {
    watcher_ = std::make_unique<FolderWatcher>(MakePort(), options);
  }
  std::unique_ptr<FolderPort> MakePort() const {
    if (IsInotify()) {
      auto port = std::make_unique<InotifyPort>();
      EXPECT_EQ(port->Open(), "");
      return port;
    }
    FanGroup group;
    (void)group.Open();
    return std::make_unique<FanInodePort>(std::move(group));
  }
  void Cover(const std::vector<std::string>& ignore = {}) {
    watcher_->Add({root_, ignore});
    Settle();
    ASSERT_TRUE(seen_.Has("covered r")) << testing::PrintToString(seen_.log);
    seen_.log.clear();
  }
  /// Until there is nothing to read and nothing to do.
  void Settle() {
    bool more = true;
    while (more) {
      more = watcher_->Read(seen_);
      more = watcher_->Advance(milliseconds(50), seen_) || more;
    }
  }
  std::vector<std::string> SettleAndTake() {
    Settle();
    return seen_.Take();
  }
  std::set<std::string> OnDisk() const {
    std::set<std::string> paths;
    test::WatcherRecorder::AddAll(root_, paths);
    return paths;
  }
  /// A file made in each folder is reported at its path, and nothing else is.
  void ExpectAllIsWatched() {
    Settle();
    seen_.Take();
    std::vector<std::string> expected;
    uint64_t folders = 0;
    for (const std::string& path : OnDisk()) {
      if (!fs::is_directory(fs::symlink_status(path))) continue;
      ++folders;
      expected.push_back("created " + (path + "/probe").substr(dir_.Path().size() + 1));
      (void)mknod((path + "/probe").c_str(), S_IFREG | 0600, 0);
    }
    Settle();
    std::vector<std::string> got = seen_.Take();
    std::sort(got.begin(), got.end());
    std::sort(expected.begin(), expected.end());
    EXPECT_EQ(got, expected);
    EXPECT_EQ(watcher_->Watches(root_), folders);
  }

  TempDir dir_;
  const std::string root_ = dir_ / "r";
  test::WatcherRecorder seen_{dir_.Path()};
  std::unique_ptr<FolderWatcher> watcher_;
};

INSTANTIATE_TEST_SUITE_P(Ports, FolderWatcherTest, testing::Values("inotify", "inode"),
                         [](const auto& port) { return std::string(port.param); });

TEST_P(FolderWatcherTest, AFileIsReportedByItsNumberWhenItsNameMayTellNothingOfTheOthers) {
  WriteFile(root_ + "/a", "1");
  Cover();
  struct stat status = {};
  ASSERT_EQ(stat((root_ + "/a").c_str(), &status), 0);
  const std::set<uint64_t> number = {status.st_ino};
  const std::set<uint64_t> only_inode = IsInotify() ? std::set<uint64_t>() : number;
  const auto reported = [this](const std::function<void()>& act) {
    act();
    Settle();
    return std::exchange(seen_.numbers, {});
  };
  const std::string name = root_ + "/b";
  const auto write = [&] { fs::create_hard_link(root_ + "/a", name), WriteFile(name, "2"); };
  EXPECT_THAT(reported([&] { WriteFile(root_ + "/a", "3"), WriteFile(root_ + "/new", "4"); }), IsEmpty());
  EXPECT_EQ(reported(write), number);
  fs::remove(name);
  EXPECT_EQ(reported([&] { write(), fs::remove(name); }), only_inode);
  EXPECT_EQ(reported([&] { write(), fs::rename(name, dir_ / "out"), fs::remove(dir_ / "out"); }), only_inode);
}

struct Row {
  const char* claim;
  std::function<void(const std::string& root)> act;
  std::vector<std::string> reported;  ///< without "modified", which comes once or several times
};

void Rename(const std::string& from, const std::string& to) { ASSERT_EQ(rename(from.c_str(), to.c_str()), 0); }
void Touch(const std::string& path) { ASSERT_EQ(mknod(path.c_str(), S_IFREG | 0600, 0), 0); }
void MakeFolder(const std::string& path) { ASSERT_EQ(mkdir(path.c_str(), 0755), 0); }

/// Everything is done before the first record is read. "old" is a folder with a file, and "deep" two folders.
const Row kRows[] = {
    {"a file is written", [](const std::string& r) { WriteFile(r + "/f", "x"); }, {"created r/f", "written r/f"}},
    {"attributes of files and folders",
     [](const std::string& r) {
       (void)chmod((r + "/old/f").c_str(), 0700);
       (void)chmod((r + "/old").c_str(), 0700);
     },
     {"attributes r/old/f", "attributes r/old/"}},
    {"a file is replaced",
     [](const std::string& r) {
       Touch(r + "/g");
       Rename(r + "/g", r + "/old/f");
     },
     {"created r/g", "renamed r/g -> r/old/f"}},
    {"a renamed folder has its new path from then on",
     [](const std::string& r) {
       Touch(r + "/old/before");
       Rename(r + "/old", r + "/new");
       Touch(r + "/new/after");
     },
     {"created r/old/before", "renamed r/old -> r/new/", "created r/new/after"}},
    {"what is below a renamed folder stays watched",
     [](const std::string& r) {
       Rename(r + "/deep", r + "/old/deep");
       Touch(r + "/old/deep/below/f");
     },
     {"renamed r/deep -> r/old/deep/", "created r/old/deep/below/f"}},
    {"a folder leaves",
     [](const std::string& r) {
       Rename(r + "/deep", r + "/../out");
       Touch(r + "/../out/f");
     },
     {"deleted r/deep/"}},
    {"a file leaves and another comes",
     [](const std::string& r) {
       Rename(r + "/old/f", r + "/../f");
       Rename(r + "/../f", r + "/g");
     },
     {"deleted r/old/f", "created r/g"}},
    {"names are bytes",
     [](const std::string& r) {
       Rename(r + "/old", r + "/a\nb");
       Touch(r + "/a\nb/\xFF");
     },
     {"renamed r/old -> r/a\nb/", "created r/a\nb/\xFF"}},
    {"what is removed with all below",
     [](const std::string& r) { fs::remove_all(r + "/old"); },
     {"deleted r/old/f", "deleted r/old/"}},
};

TEST_P(FolderWatcherTest, ChangesAreReportedWithThePathsOfTheMoment) {
  for (const Row& row : kRows) {
    SCOPED_TRACE(row.claim);
    fs::remove_all(root_);
    WriteFile(root_ + "/old/f", "");
    fs::create_directories(root_ + "/deep/below");
    MakeWatcher({});
    Cover();
    row.act(root_);
    std::vector<std::string> reported = SettleAndTake();
    std::erase_if(reported, [](const std::string& line) { return line.compare(0, 8, "modified") == 0; });
    reported.erase(std::unique(reported.begin(), reported.end()), reported.end());
    EXPECT_EQ(reported, row.reported);
    EXPECT_EQ(seen_.model, OnDisk());
    ExpectAllIsWatched();
    fs::remove_all(dir_ / "out");
  }
}

TEST_P(FolderWatcherTest, EachFolderOfANewTreeIsReportedAfterItIsWatched) {
  Cover();
  fs::create_directories(root_ + "/a/b/c");
  fs::create_directories(dir_ / "out/d/e");
  Rename(dir_ / "out", root_ + "/in");
  const std::vector<std::string> reported = SettleAndTake();
  for (const char* folder : {"a/", "a/b/", "a/b/c/", "in/", "in/d/", "in/d/e/"}) {
    EXPECT_THAT(reported, Contains("created r/" + std::string(folder)));
  }
  ExpectAllIsWatched();
}

TEST_P(FolderWatcherTest, IgnoredFoldersAndLinksAreNotEntered) {
  fs::create_directories(root_ + "/@eaDir/x");
  fs::create_directories(root_ + "/a/@eaDir/y");
  fs::create_directory_symlink(dir_.Path(), root_ + "/link");
  Cover({"@eaDir"});
  MakeFolder(root_ + "/a/b");
  Rename(root_ + "/a/@eaDir/y", root_ + "/a/y");
  Rename(root_ + "/a/b", root_ + "/a/@eaDir/b");
  Settle();
  EXPECT_EQ(watcher_->Watches(root_), 3U) << "r, a, a/y";
  Touch(root_ + "/a/@eaDir/b/f");
  seen_.Take();
  EXPECT_THAT(SettleAndTake(), IsEmpty());
}

TEST_P(FolderWatcherTest, ARootWithTooManyFoldersIsRefusedAndAllItsWatchesGoBack) {
  fs::create_directories(root_ + "/a/b");
  fs::create_directories(dir_ / "small");
  MakeWatcher({"", 4});
  watcher_->Add({dir_ / "small"});
  watcher_->Add({root_});
  const std::string setting = IsInotify() ? "fs.inotify.max_user_watches" : "fs.fanotify.max_user_marks";
  EXPECT_THAT(SettleAndTake(), ElementsAre("covered small", AllOf(HasSubstr("refused r: "), HasSubstr(setting))));
  EXPECT_EQ(watcher_->Watches(root_), 0U);
  Touch(root_ + "/a/f");
  Touch(dir_ / "small/f");
  EXPECT_THAT(SettleAndTake(), ElementsAre("created small/f"));
  watcher_->Remove(dir_ / "small");
  watcher_->Add({root_ + "/a/b"});
  EXPECT_THAT(SettleAndTake(), ElementsAre("covered r/a/b")) << "there is room again";
}

TEST_P(FolderWatcherTest, RootsInEachOtherShareWatches) {
  fs::create_directories(root_ + "/a/b");
  Cover();
  const uint64_t watches = watcher_->Folders().Keys();
  watcher_->Add({root_ + "/a"});
  EXPECT_THAT(SettleAndTake(), ElementsAre("covered r/a"));
  EXPECT_EQ(watcher_->Folders().Keys(), watches);
  watcher_->Remove(root_);
  Settle();
  Touch(root_ + "/f");
  Touch(root_ + "/a/b/f");
  EXPECT_THAT(SettleAndTake(), ElementsAre("created r/a/b/f"));
  EXPECT_EQ(watcher_->Watches(root_ + "/a"), 2U);
}

TEST_P(FolderWatcherTest, LostRecordsAreReportedAndEverythingIsWatchedAgain) {
  Cover();
  fs::create_directories(root_ + "/a/b");
  uint64_t records = 0;
  std::ifstream("/proc/sys/fs/" + std::string(IsInotify() ? "inotify" : "fanotify") + "/max_queued_events") >> records;
  // The kernel joins what becomes of one file where it can: then it has one record for each.
  for (uint64_t i = 0; i < (IsInotify() ? records / 2 : records) + 10; ++i) {
    Touch(root_ + "/" + std::to_string(i));
    ASSERT_EQ(unlink((root_ + "/" + std::to_string(i)).c_str()), 0);
  }
  fs::rename(root_ + "/a", root_ + "/c");
  fs::create_directories(root_ + "/a/d");
  Settle();
  EXPECT_TRUE(seen_.Has("lost"));
  EXPECT_EQ(seen_.log.back(), "covered r");
  EXPECT_EQ(seen_.model, OnDisk());
  ExpectAllIsWatched();
}

TEST_P(FolderWatcherTest, ARootThatMovesOrGoesIsDisturbed) {
  fs::create_directories(root_ + "/a/b");
  watcher_->Add({root_ + "/a/b"});
  Settle();
  Rename(root_, dir_ / "s");
  EXPECT_THAT(SettleAndTake(), Contains("disturbed r/a/b")) << "something above it moved";
  Rename(dir_ / "s", root_);
  Cover();
  Rename(root_ + "/a", root_ + "/c");
  EXPECT_THAT(SettleAndTake(), Contains("disturbed r/a/b")) << "in another root";
  fs::remove_all(root_);
  EXPECT_THAT(SettleAndTake(), Contains("disturbed r"));
  watcher_->Add({root_});
  EXPECT_THAT(SettleAndTake(), Contains("refused r: No such file or directory"));
}

TEST_P(FolderWatcherTest, TheCookieIsReportedInItsPlace) {
  const std::string cookie = dir_ / "cookies/cookie";
  Cover();
  Touch(root_ + "/before");
  ASSERT_EQ(utimensat(AT_FDCWD, cookie.c_str(), nullptr, 0), 0);
  Touch(root_ + "/after");
  EXPECT_THAT(SettleAndTake(), ElementsAre("created r/before", "cookie", "created r/after"));
}

/// Nobody may read it; root may, and a lack of rights cannot be had.
TEST_P(FolderWatcherTest, AnUnreadableFolderIsTriedAgainWhenItsPermissionsChange) {
  if (geteuid() == 0) GTEST_SKIP() << "root reads everything";
  fs::create_directories(root_ + "/a/b");
  ASSERT_EQ(chmod((root_ + "/a").c_str(), 0), 0);
  Cover();
  EXPECT_EQ(watcher_->Watches(root_), 1U);
  ASSERT_EQ(chmod((root_ + "/a").c_str(), 0755), 0);
  EXPECT_THAT(SettleAndTake(), Contains("created r/a/"));
  ExpectAllIsWatched();
}

TEST_P(FolderWatcherTest, MountsBelowARootAreNotEnteredAndCanBeUnmounted) {
  MakeFolder(root_ + "/m");
  if (mount("none", (root_ + "/m").c_str(), "tmpfs", 0, "") != 0) GTEST_SKIP() << strerror(errno);
  MakeFolder(root_ + "/m/x");
  watcher_->Add({root_});
  Settle();
  EXPECT_EQ(watcher_->Watches(root_), 1U);
  watcher_->Add({root_ + "/m"});
  Settle();
  EXPECT_EQ(watcher_->Watches(root_ + "/m"), 2U);
  EXPECT_EQ(umount((root_ + "/m").c_str()), 0) << strerror(errno);
  if (IsInotify()) {
    EXPECT_THAT(SettleAndTake(), Contains("disturbed r/m"));
  }
}

TEST_P(FolderWatcherTest, AnyOrderOfOperationsEndsWithTheTreeOnDisk) {
  for (unsigned seed = 1; seed <= 6; ++seed) {
    SCOPED_TRACE("seed " + std::to_string(seed));
    fs::remove_all(root_);
    fs::create_directory(root_);
    MakeWatcher({});
    Cover();
    test::RandomChanges changes(root_, seed, false);
    std::mt19937 random(seed);
    const size_t stretch = seed % 3 == 0 ? 200 : 1 + seed % 20;
    for (int i = 0; i < 300; ++i) {
      changes.Do();
      if (random() % stretch == 0) (void)watcher_->Read(seen_);
      if (random() % stretch == 0) (void)watcher_->Advance(milliseconds(0), seen_);
    }
    Settle();
    ASSERT_EQ(seen_.model, OnDisk());
    ExpectAllIsWatched();
    if (HasFailure()) return;
  }
}

TEST_P(FolderWatcherTest, AFastWriterBesideTheReaderLosesNothing) {
  for (unsigned seed = 1; seed <= 2; ++seed) {
    SCOPED_TRACE("seed " + std::to_string(seed));
    fs::remove_all(root_);
    fs::create_directory(root_);
    MakeWatcher({});
    Cover();
    std::atomic<bool> done = false;
    std::thread writer([&] {
      test::RandomChanges changes(root_, seed, false);
      for (int i = 0; i < 1500; ++i) changes.Do();
      done = true;
    });
    while (!done) {
      (void)watcher_->Read(seen_);
      (void)watcher_->Advance(milliseconds(1), seen_);
    }
    writer.join();
    Settle();
    ASSERT_EQ(seen_.model, OnDisk());
    ExpectAllIsWatched();
    if (HasFailure()) return;
  }
}

}  // namespace
}  // namespace ferrox::notifyd
