// Catches changes that the watcher of a whole file system misses, or tells of the wrong path.
#include "services/kovanotifyd/filesystem/filesystem_watcher.h"

#include <fcntl.h>
#include <sched.h>
#include <sys/mount.h>
#include <sys/stat.h>
#include <sys/wait.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <cstdio>
#include <cstring>
#include <filesystem>
#include <functional>
#include <iterator>
#include <map>
#include <random>
#include <set>
#include <string>
#include <utility>
#include <vector>

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include "base/path.h"
#include "base/scope_exit.h"
#include "tests/notifyd/random_changes.h"
#include "tests/notifyd/watcher_recorder.h"
#include "tests/support/temp_dir.h"

namespace ferrox::notifyd {
namespace {

using test::TempDir;
using test::WriteFile;
using testing::ElementsAre;
using testing::ElementsAreArray;
using testing::IsEmpty;
namespace fs = std::filesystem;

/// Mounts an empty file system that nobody else sees. @return whether that is permitted, with errno.
bool MountPrivately(const std::string& folder) {
  return unshare(CLONE_NEWNS) == 0 && mount(nullptr, "/", nullptr, MS_REC | MS_PRIVATE, nullptr) == 0 &&
         mount("none", folder.c_str(), "tmpfs", 0, nullptr) == 0;
}

/// A file system that is fast enough to overflow the kernel's queue, and in which nobody else does: a mark is told of
/// the changes of all. Where it may not be mounted, one that is shared.
class QuietFileSystem {
 public:
  QuietFileSystem() : is_own_(MountPrivately(point_.Path())) {}
  ~QuietFileSystem() {
    if (is_own_) (void)umount2(point_.Path().c_str(), MNT_DETACH);
  }
  std::string Path() const {
    if (is_own_) return point_.Path();
    return access("/dev/shm", W_OK) == 0 ? "/dev/shm" : fs::temp_directory_path().string();
  }

 private:
  const TempDir point_;
  const bool is_own_;
};

class FilesystemWatcherTest : public testing::Test {
 protected:
  void SetUp() override {
    fs::create_directory(Root());
    fs::create_directories(dir_ / "state");
    WriteFile(dir_ / "cookie", "");
    Watch({});
  }

  std::string Root() const { return dir_ / "r"; }

  /// Watches the root, or skips the test where the kernel does not grant that.
  void Watch(FilesystemWatcher::Options options) {
    options.cookie = dir_ / "cookie";
    options.quiet_folders = {dir_ / "state"};
    watcher_ = std::make_unique<FilesystemWatcher>(options);
    watcher_->Add({Root()});
    while (watcher_->Advance(std::chrono::milliseconds(10), notes_)) {
    }
    const std::vector<std::string> reported = notes_.Take();
    if (!reported.empty() && reported[0].compare(0, 7, "refused") == 0) GTEST_SKIP() << reported[0];
    ASSERT_THAT(reported, ElementsAre("covered r"));
  }

  std::vector<std::string> Reported() {
    while (watcher_->Read(notes_)) {
    }
    return notes_.Take();
  }

  /// An empty file system that nobody else sees; skips the test where that is not permitted.
  std::string MountOwnFileSystem(const std::string& name) {
    const std::string folder = dir_ / name;
    fs::create_directories(folder);
    const bool done = MountPrivately(folder);
    const int error = errno;
    [&] {
      if (!done) GTEST_SKIP() << "no mounts of one's own: " << strerror(error);
    }();
    return folder;
  }

  void MakeChanges(unsigned seed, bool fresh_names);

  const QuietFileSystem file_system_;
  TempDir dir_{file_system_.Path()};
  test::WatcherRecorder notes_{dir_.Path()};
  std::unique_ptr<FilesystemWatcher> watcher_;
};

TEST_F(FilesystemWatcherTest, TellsWhatHappened) {
  const std::string root = Root();
  const std::string outside = dir_ / "outside";
  fs::create_directories(outside + "/full/below");
  struct Row {
    const char* what;
    std::function<void()> act;
    std::vector<std::string> reported;
  };
  const std::vector<Row> rows = {
      {"new file", [&] { WriteFile(root + "/f", "1"); }, {"created r/f", "written r/f"}},
      {"written", [&] { WriteFile(root + "/f", "22"); }, {"written r/f"}},
      {"mode", [&] { (void)chmod((root + "/f").c_str(), 0600); }, {"attributes r/f"}},
      {"rename", [&] { fs::rename(root + "/f", root + "/g"); }, {"renamed r/f -> r/g"}},
      {"link", [&] { fs::create_hard_link(root + "/g", root + "/h"); }, {"created r/h"}},
      {"replaced", [&] { fs::rename(outside + "/full/below", root + "/d"); }, {"created r/d/"}},
      {"folder's mode", [&] { (void)chmod((root + "/d").c_str(), 0700); }, {"attributes r/d/"}},
      {"root's mode", [&] { (void)chmod(root.c_str(), 0700); }, {"attributes r/"}},
      {"mode above", [&] { (void)chmod(dir_.Path().c_str(), 0710); }, {"attributes r/"}},
      {"into a folder", [&] { fs::rename(root + "/h", root + "/d/h"); }, {"renamed r/h -> r/d/h"}},
      {"exchange",
       [&] { (void)renameat2(AT_FDCWD, (root + "/d").c_str(), AT_FDCWD, (root + "/g").c_str(), RENAME_EXCHANGE); },
       {"renamed r/d -> r/g/", "created r/d"}},
      {"delete", [&] { fs::remove(root + "/d"); }, {"deleted r/d"}},
      {"out", [&] { fs::rename(root + "/g", outside + "/g"); }, {"deleted r/g/"}},
      {"outside", [&] { WriteFile(outside + "/g/f", "1"); }, {}},
      {"in", [&] { fs::rename(outside + "/g", root + "/i"); }, {"created r/i/"}},
      {"below", [&] { fs::remove(root + "/i/h"), fs::remove(root + "/i/f"); }, {"deleted r/i/h", "deleted r/i/f"}},
      {"removed while behind",
       [&] { WriteFile(root + "/i/x", "1"), fs::remove_all(root + "/i"); },
       {"deleted r/i/x", "deleted r/i/"}},
      {"linked back",
       [&] {
         WriteFile(root + "/l", "1");
         fs::rename(root + "/l", root + "/m");
         fs::create_hard_link(root + "/m", root + "/l");
       },
       {"created r/l", "written r/l", "renamed r/l -> r/m", "created r/l"}},
      {"removed and linked",
       [&] { fs::remove(root + "/l"), fs::create_hard_link(root + "/m", root + "/l"); },
       {"deleted r/l", "created r/l"}},
      {"the cookie", [&] { (void)utimensat(AT_FDCWD, (dir_ / "cookie").c_str(), nullptr, 0); }, {"cookie"}},
      {"above",
       [&] { fs::rename(dir_.Path(), dir_.Path() + "-"), fs::rename(dir_.Path() + "-", dir_.Path()); },
       {"disturbed r", "disturbed r"}},
      {"the root", [&] { fs::rename(root, dir_ / "s"); }, {"disturbed r"}},
  };
  for (const Row& row : rows) {
    SCOPED_TRACE(row.what);
    row.act();
    EXPECT_THAT(Reported(), ElementsAreArray(row.reported));
  }
  EXPECT_EQ(watcher_->Watches(Root()), 1U);
  watcher_->Remove(Root());
  WriteFile(dir_ / "s/f", "1");
  EXPECT_THAT(Reported(), IsEmpty());
}

TEST_F(FilesystemWatcherTest, AFileIsReportedByItsNumberWhenItsNameTellsNothingOfTheOthers) {
  const std::string a = Root() + "/a";
  const std::string inside = Root() + "/b";
  const std::string outside = dir_ / "b";
  const auto link = [&a](const std::string& name) {
    fs::create_hard_link(a, name);
    WriteFile(name, "through the other name");
  };
  struct Row {
    const char* what;
    std::function<void()> act;
    bool reported;
  };
  const std::vector<Row> rows = {
      {"new", [&] { WriteFile(a, "1"); }, false},
      {"one name", [&] { WriteFile(a, "2"), (void)chmod(a.c_str(), 0600); }, false},
      {"gone inside", [&] { link(inside), fs::remove(inside); }, true},
      {"moved out", [&] { link(inside), fs::rename(inside, outside); }, true},
      {"mode outside", [&] { (void)chmod(outside.c_str(), 0640); }, true},
      {"replaced", [&] { WriteFile(inside, "2"), fs::rename(inside, outside); }, true},
      {"replaced after a write", [&] { fs::remove(outside), link(outside), fs::rename(a, inside); }, true},
      {"one name again", [&] { fs::remove(outside), fs::rename(inside, a), WriteFile(a, "3"); }, true},
      {"no other name", [&] { WriteFile(a, "3"); }, false},
      {"linked outside", [&] { fs::create_hard_link(a, outside); }, true},
      {"renamed outside", [&] { fs::rename(outside, dir_ / "c"); }, true},
      {"removed outside", [&] { fs::remove(dir_ / "c"); }, true},
      {"gone outside", [&] { link(outside), fs::remove(outside); }, true},
      {"others", [&] { WriteFile(outside, "4"), WriteFile(outside, "5"), fs::rename(outside, dir_ / "c"); }, false},
  };
  for (const Row& row : rows) {
    SCOPED_TRACE(row.what);
    notes_.numbers.clear();
    row.act();
    const std::vector<std::string> reported = Reported();
    struct stat status = {};
    (void)(stat(a.c_str(), &status) == 0 || stat(inside.c_str(), &status) == 0);
    const std::set<uint64_t> number = {status.st_ino};
    EXPECT_EQ(notes_.numbers, row.reported ? number : std::set<uint64_t>()) << testing::PrintToString(reported);
  }
}

TEST_F(FilesystemWatcherTest, NamesInDoubtAreReportedWhenTheKernelJoinsRecords) {
  const std::string a = Root() + "/a";
  const std::string b = Root() + "/b";
  fs::create_directory(a);
  (void)Reported();
  for (const auto& [from, to] : {std::pair(a, b), {b, a}, {a, b}}) fs::rename(from, to);
  WriteFile(b + "/f", "");
  const std::vector<std::string> reported = Reported();
  EXPECT_THAT(reported, testing::IsSupersetOf({"uncertain r/a", "uncertain r/b"}));
  WriteFile(b + "/g", "");
  EXPECT_THAT(Reported(), ElementsAre("created r/b/g", "written r/b/g")) << "the folder was looked for";
}

TEST_F(FilesystemWatcherTest, AnOverflowIsReportedAndThenAllIsCoveredAgain) {
  for (int i = 0; i < 20000; ++i) (void)mknod((Root() + "/f" + std::to_string(i)).c_str(), S_IFREG | 0600, 0);
  EXPECT_THAT(Reported(), testing::IsSupersetOf({"lost", "disturbed r", "covered r"}));
  WriteFile(Root() + "/f1", "1");
  EXPECT_THAT(Reported(), ElementsAre("written r/f1"));
}

TEST_F(FilesystemWatcherTest, TooMuchThatWaitsInMemoryCountsAsLost) {
  fs::create_directory(Root() + "/d");
  FilesystemWatcher::Options options;
  options.records_max = 2000;
  Watch(options);
  if (IsSkipped()) return;
  for (int i = 0; i < 3000; ++i) (void)mknod((Root() + "/d/f" + std::to_string(i)).c_str(), S_IFREG | 0600, 0);
  EXPECT_THAT(Reported(), testing::IsSupersetOf({"lost", "disturbed r", "covered r"}));
}

/// Elsewhere, other programs that write to the same file system would wake it.
TEST_F(FilesystemWatcherTest, QuietFoldersDoNotWakeIt) {
  const std::string own = MountOwnFileSystem("own");
  if (IsSkipped()) return;
  for (const char* folder : {"/r", "/state"}) fs::create_directory(own + folder);
  FilesystemWatcher::Options options;
  options.cookie = dir_ / "cookie";
  options.quiet_folders = {own + "/state"};
  FilesystemWatcher watcher(options);
  watcher.Add({own + "/r"});
  (void)watcher.Advance(std::chrono::milliseconds(10), notes_);
  const auto wakes = [&](const std::string& file) {
    WriteFile(own + file, "line\n");
    bool woken = false;
    while (watcher.Read(notes_)) woken = true;
    return woken;
  };
  for (int i = 0; i < 3; ++i) (void)wakes("/state/queue");
  EXPECT_THAT(notes_.Take(), ElementsAre("covered own/r"));
  EXPECT_FALSE(wakes("/state/queue"));
  EXPECT_TRUE(wakes("/r/f"));
  EXPECT_EQ(umount(own.c_str()), 0) << strerror(errno);
}

/// The root's tree as a listener builds it from the reports alone.
class ReportedTree {
 public:
  std::string Apply(const Change& change, bool is_strict) {
    const bool is_known = names_.count(change.path) != 0;
    switch (change.kind) {
      case Change::Kind::kCreated:
        if (is_strict && is_known) return "there already: " + change.path;
        names_[change.path] = change.is_folder;
        if (change.is_folder && !is_strict) in_doubt_.insert(change.path);  // the other half of an exchange is full
        break;
      case Change::Kind::kDeleted:
        Erase(change.path);  // of what was made and removed at once, only the latter is reported
        break;
      case Change::Kind::kRenamed:
        if (is_strict && names_.count(change.old_path) == 0) return "not there: " + change.old_path;
        Move(change.old_path, change.path, change.is_folder);
        break;
      case Change::Kind::kByNumber:
      case Change::Kind::kAttributesByNumber:
        break;
      case Change::Kind::kUncertain:
        if (is_strict) return "in doubt: " + change.path;
        in_doubt_.insert(change.path);
        break;
      default:
        if (is_strict && !is_known) return "not there: " + change.path;
    }
    return "";
  }

  void LookAtWhatIsInDoubt() {
    for (const std::string& path : in_doubt_) {
      Erase(path);
      const fs::file_status status = fs::symlink_status(path);
      if (!fs::exists(status)) continue;
      names_[path] = fs::is_directory(status);
      if (!fs::is_directory(status)) continue;
      for (const auto& entry : fs::recursive_directory_iterator(path)) names_[entry.path()] = entry.is_directory();
    }
  }

  const std::map<std::string, bool>& Names() const { return names_; }

 private:
  void Erase(const std::string& top) {
    std::erase_if(names_, [&top](const auto& name) { return base::IsAtOrBelow(name.first, top); });
  }
  void Move(const std::string& from, const std::string& to, bool is_folder) {
    std::map<std::string, bool> moved = {{to, is_folder}};
    for (const auto& [path, kind] : names_) {
      if (base::IsAtOrBelow(path, from)) moved[to + path.substr(from.size())] = kind;
    }
    std::set<std::string> doubts;
    for (const std::string& path : in_doubt_)
      doubts.insert(base::IsAtOrBelow(path, from) ? to + path.substr(from.size()) : path);
    in_doubt_.merge(doubts);
    Erase(from);
    Erase(to);
    names_.merge(moved);
  }

  std::map<std::string, bool> names_;
  std::set<std::string> in_doubt_;
};

/// Reads now and then, or, with every third seed, all the time while another process makes the changes.
void FilesystemWatcherTest::MakeChanges(unsigned seed, bool fresh_names) {
  test::RandomChanges changes(Root(), seed, fresh_names);
  std::mt19937 random(seed);
  const bool is_beside = seed % 3 == 0;
  const pid_t child = is_beside ? fork() : 0;
  for (int i = 0; i < 250 && child == 0; ++i) {
    changes.Do();
    if (!is_beside && random() % 100 == 0) (void)watcher_->Read(notes_);
  }
  if (!is_beside) return;
  if (child == 0) _exit(0);
  while (waitpid(child, nullptr, WNOHANG) == 0) (void)watcher_->Read(notes_);
}

TEST_F(FilesystemWatcherTest, ReplayOfWhatIsReportedGivesTheTree) {
  for (unsigned seed = 0; seed < 12; ++seed) {
    const bool is_strict = seed % 2 == 0;
    SCOPED_TRACE("seed " + std::to_string(seed));
    FilesystemWatcher::Options options;
    options.folders_max = 1 + seed * 3;
    Watch(options);
    if (IsSkipped()) return;
    notes_.changes.clear();
    MakeChanges(seed, is_strict);
    (void)Reported();
    ReportedTree tree;
    for (const Change& change : notes_.changes) ASSERT_EQ(tree.Apply(change, is_strict), "");
    tree.LookAtWhatIsInDoubt();
    std::map<std::string, bool> real;
    for (const auto& entry : fs::recursive_directory_iterator(Root())) real[entry.path()] = entry.is_directory();
    std::vector<std::pair<std::string, bool>> wrong;
    std::set_symmetric_difference(tree.Names().begin(), tree.Names().end(), real.begin(), real.end(),
                                  std::back_inserter(wrong));
    ASSERT_THAT(wrong, IsEmpty());
    fs::remove_all(Root());
    fs::create_directory(Root());
  }
}

TEST_F(FilesystemWatcherTest, AVolumeCanBeUnmountedAndComesAgain) {
  for (int i = 0; i < 2; ++i) {
    const std::string volume = MountOwnFileSystem("volume");
    if (IsSkipped()) return;
    fs::create_directories(volume + "/share/sub");
    watcher_->Add({volume + "/share"});
    (void)watcher_->Advance(std::chrono::milliseconds(10), notes_);
    EXPECT_THAT(notes_.Take(), ElementsAre("covered volume/share"));
    WriteFile(volume + "/share/sub/f", "1");
    EXPECT_THAT(Reported(), ElementsAre("created volume/share/sub/f", "written volume/share/sub/f"));
    ASSERT_EQ(umount(volume.c_str()), 0) << strerror(errno);
  }
}

}  // namespace
}  // namespace ferrox::notifyd
