#include "services/kovanotifyd/folder_watcher.h"

#include <fcntl.h>
#include <stdio.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <filesystem>
#include <random>
#include <thread>

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include "services/kovanotifyd/fan_inode_port.h"
#include "services/kovanotifyd/inotify_port.h"
#include "tests/notifyd/watcher_recorder.h"
#include "tests/support/temp_dir.h"

namespace ferrox::notifyd {
namespace {

namespace fs = std::filesystem;
using std::chrono::milliseconds;
using test::TempDir;
using test::WriteFile;
using testing::Contains;
using testing::ElementsAre;
using testing::HasSubstr;
using testing::IsEmpty;
using testing::Not;

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

/// What the random operations are made of: few names, so that they meet often.
class RandomOperations {
 public:
  RandomOperations(const std::string& root, unsigned seed) : root_(root), random_(seed) {}

  void Do() {
    const std::string a = Place();
    const std::string b = Place();
    switch (random_() % 12) {
      case 0:
      case 1:
      case 2:
        (void)mkdir(a.c_str(), 0755);
        break;
      case 3: {
        std::error_code error;
        fs::create_directories(a + "/x/y/z", error);
        break;
      }
      case 4: {
        std::error_code error;
        fs::remove_all(a, error);
        break;
      }
      case 5:
        (void)mknod(a.c_str(), S_IFREG | 0600, 0);
        break;
      case 6:
        (void)unlink(a.c_str());
        break;
      case 7:
        (void)renameat2(AT_FDCWD, a.c_str(), AT_FDCWD, b.c_str(), RENAME_EXCHANGE);
        break;
      default:
        (void)rename(a.c_str(), b.c_str());
    }
  }
  size_t Number(size_t below) { return random_() % below; }

 private:
  std::string Place() {
    std::string path = root_;
    for (size_t depth = 1 + random_() % 4; depth > 0; --depth) path += std::string("/") + "abx"[random_() % 3];
    return path;
  }

  std::string root_;
  std::mt19937 random_;
};

TEST_P(FolderWatcherTest, AnyOrderOfOperationsEndsWithTheTreeOnDisk) {
  for (unsigned seed = 1; seed <= 6; ++seed) {
    SCOPED_TRACE("seed " + std::to_string(seed));
    fs::remove_all(root_);
    fs::create_directory(root_);
    MakeWatcher({});
    Cover();
    RandomOperations operations(root_, seed);
    const size_t stretch = seed % 3 == 0 ? 200 : 1 + seed % 20;
    for (int i = 0; i < 300; ++i) {
      operations.Do();
      if (operations.Number(stretch) == 0) (void)watcher_->Read(seen_);
      if (operations.Number(stretch) == 0) (void)watcher_->Advance(milliseconds(0), seen_);
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
      RandomOperations operations(root_, seed);
      for (int i = 0; i < 3000; ++i) operations.Do();
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
