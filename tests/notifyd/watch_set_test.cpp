// Catches folders watched in a worse way than they could be, and gaps that no comparison makes up for.
#include "services/kovanotifyd/roots/watch_set.h"

#include <sys/mount.h>

#include <filesystem>

#include <gtest/gtest.h>

#include "services/kovanotifyd/roots/watch_roots.h"
#include "tests/contract/in_child.h"
#include "tests/notifyd/fake_watcher.h"
#include "tests/support/temp_dir.h"

namespace ferrox::notifyd {
namespace {

namespace fs = std::filesystem;

constexpr std::chrono::milliseconds kSlice{20};

/// Two fake watchers, "best" and "next", and what is reported of "/.../root", which is written "R" here.
class WatchSetTest : public testing::Test, public WatchSet::Listener {
 protected:
  WatchSetTest() {
    fs::create_directory(root_);
    std::vector<Way> ways;
    for (const char* name : {"best", "next"}) {
      auto watcher = std::make_unique<FakeWatcher>();
      fakes_.push_back(watcher.get());
      ways.push_back({name, std::move(watcher)});
    }
    set_ = std::make_unique<WatchSet>(std::move(ways), true, *this);
  }

  void OnChange(Change) override {}
  void OnCompare(const std::string& path) override { reported_ += "compare " + path.substr(dir_.Path().size()) + " "; }
  void OnLost(size_t) override { reported_ += "lost "; }
  void OnCookie(size_t) override {}

  void Follow(const std::vector<std::string>& paths) {
    Registration registration = {"test", "/queue"};
    for (const std::string& path : paths) registration.watches.push_back({path, 0xFFC6});
    set_->Follow({registration});
    Advance();
  }
  void Advance() {
    while (set_->Advance(kSlice)) continue;
  }
  void Examine() {
    set_->Examine();
    Advance();
  }
  std::string Reported() { return std::exchange(reported_, {}); }
  WatchState State() const { return set_->StateOf({root_}); }

  const test::TempDir dir_;
  const std::string root_ = fs::canonical(dir_.Path()).string() + "/root";
  std::vector<FakeWatcher*> fakes_;
  std::unique_ptr<WatchSet> set_;
  std::string reported_;
};

TEST_F(WatchSetTest, TheFirstWayThatDoesNotRefuseIsTakenAndTheReasonsAreKept) {
  const struct {
    const char* best;
    const char* next;
    const char* way;
    const char* reason;
    bool covered;
  } kRows[] = {
      {"", "", "best", "", true},
      {"needs luck", "", "next", "best: needs luck", true},
      {"needs luck", "is full", "periodic scan", "best: needs luck; next: is full", false},
  };
  for (const auto& row : kRows) {
    SCOPED_TRACE(row.way);
    fakes_[0]->Refuse(row.best);
    fakes_[1]->Refuse(row.next);
    Follow({});
    Follow({root_});
    EXPECT_EQ(State().way, row.way);
    EXPECT_EQ(State().reason, row.reason);
    EXPECT_EQ(State().covered, row.covered);
    EXPECT_NE(Reported(), "") << "what is covered is compared, whatever the way";
  }
}

TEST_F(WatchSetTest, WithoutScansAFolderThatAllRefuseIsAProblem) {
  FakeWatcher* fake = new FakeWatcher;
  std::vector<Way> ways;
  ways.push_back({"only", std::unique_ptr<Watcher>(fake)});
  WatchSet set(std::move(ways), false, *this);
  fake->Refuse("is full");
  set.Follow({{"test", "/queue", {{root_, 1}}}});
  (void)set.Advance(kSlice);
  EXPECT_EQ(set.StateOf({root_}).way, "none");
  EXPECT_EQ(set.Roots().Problems(),
            (std::vector<std::string>{"changes of " + root_ + " are not noticed: only: is full; " +
                                      "periodic scan: switched off in the settings"}));
  EXPECT_EQ(Reported(), "");
  EXPECT_FALSE(set.Roots().HasMissing()) << "there is nothing to look for every few seconds";
}

TEST_F(WatchSetTest, ARefusalLaterMovesAFolderToTheNextWay) {
  Follow({root_});
  EXPECT_EQ(Reported(), "compare /root ");
  fakes_[0]->Say([this](WatchListener& listener) { listener.OnRefused(root_, "is full now"); });
  EXPECT_TRUE(set_->Read(0));
  Advance();
  EXPECT_EQ(State().way, "next");
  EXPECT_EQ(Reported(), "compare /root ");
  fakes_[0]->Say([this](WatchListener& listener) { listener.OnCovered(root_); });
  (void)set_->Read(0);
  EXPECT_EQ(Reported(), "") << "the former watcher has no say any more";
}

TEST_F(WatchSetTest, LostChangesAreComparedWhenAllIsWatchedAgain) {
  Follow({root_});
  (void)Reported();
  fakes_[0]->Say([](WatchListener& listener) { listener.OnLost(); });
  (void)set_->Read(0);
  EXPECT_EQ(Reported(), "lost ");
  EXPECT_TRUE(set_->Roots().IsSettingUp());
  fakes_[0]->Say([this](WatchListener& listener) { listener.OnCovered(root_); });
  (void)set_->Read(0);
  EXPECT_EQ(Reported(), "compare /root ");
  EXPECT_FALSE(set_->Roots().IsSettingUp());
}

TEST_F(WatchSetTest, WhatIsNoFolderIsWaitedFor) {
  const struct {
    const char* what;
    void (*make)(const std::string& path);
  } kRows[] = {
      {"is missing", [](const std::string&) {}},
      {"is no folder", [](const std::string& path) { test::WriteFile(path, ""); }},
      {"is a symbolic link", [](const std::string& path) { fs::create_directory_symlink("/", path); }},
  };
  for (const auto& row : kRows) {
    SCOPED_TRACE(row.what);
    fs::remove_all(root_);
    row.make(root_);
    Follow({});
    Follow({root_});
    EXPECT_EQ(State().way, "none");
    EXPECT_EQ(State().reason, row.what);
    EXPECT_TRUE(set_->Roots().HasMissing());
    EXPECT_EQ(Reported(), "") << "it may be on a volume that is not there yet";
    fs::remove(root_);
    fs::create_directory(root_);
    Examine();
    EXPECT_EQ(State().way, "best");
    EXPECT_EQ(Reported(), "compare /root ");
    Examine();
    EXPECT_EQ(Reported(), "") << "nothing changed";
  }
}

TEST_F(WatchSetTest, AFolderReachedThroughALinkIsNotWatched) {
  fs::create_directory(root_ + "/sub");
  fs::create_directory_symlink(root_, dir_ / "link");
  Follow({dir_ / "link/sub"});
  EXPECT_EQ(set_->StateOf({dir_ / "link/sub"}).reason, "is reached through a symbolic link");
}

TEST_F(WatchSetTest, ARemovedFolderIsComparedAndAReplacedOneWatchedAnew) {
  Follow({root_});
  (void)Reported();
  fs::remove(root_);
  Examine();
  EXPECT_EQ(Reported(), "compare /root ") << "its volume is still there";
  Examine();
  EXPECT_EQ(Reported(), "") << "once";
  fs::create_directory(root_);
  Examine();
  EXPECT_EQ(Reported(), "compare /root ");
  fs::rename(root_, dir_ / "aside");
  fs::create_directory(root_);
  Examine();
  EXPECT_EQ(Reported(), "compare /root ");
  fs::remove(root_);
  fs::create_directory(root_);
  Examine();
  EXPECT_EQ(Reported(), "compare /root ") << "also when the new one has the same number";
  const std::string again = "-" + root_ + " +" + root_ + " ";
  EXPECT_EQ(fakes_[0]->Calls(), "+" + root_ + " " + again + again + again);
}

TEST_F(WatchSetTest, AFolderInACoveredOneNeedsNoWatchOfItsOwnUntilItIsGone) {
  const std::string inner = root_ + "/inner";
  fs::create_directory(inner);
  Follow({root_});
  (void)Reported();
  Follow({root_, inner});
  EXPECT_EQ(fakes_[0]->Calls(), "+" + root_ + " ");
  EXPECT_TRUE(set_->StateOf({inner}).covered);
  EXPECT_EQ(Reported(), "compare /root/inner ") << "it may have changed since its application looked";
  fs::remove(inner);
  Examine();
  EXPECT_EQ(set_->StateOf({inner}).reason, "is missing");
  EXPECT_EQ(Reported(), "") << "the outer folder's watcher tells";
}

/// The rows' folders are "path ignored,ignored"; what is expected are the roots in that form.
TEST(WatchRootsTest, AreFewAndIgnoreOnlyWhatAllIgnore) {
  const struct {
    std::vector<QueueWatch> watches;
    std::string roots;
  } kRows[] = {
      {{{"/v/a", 1}, {"/v/a/b", 1}, {"/v/ab", 1}}, "/v/a /v/ab "},
      {{{"/v/a", 1, {"x"}}, {"/v/a/b", 1, {"x", "y"}}}, "/v/a x "},
      {{{"/v/a", 1, {"x"}}, {"/v/a/b", 1, {"y"}}}, "/v/a x /v/a/b y "},
      {{{"/v/a", 1, {"x"}}, {"/v/a/x/b", 1, {"x"}}}, "/v/a x /v/a/x/b x "},
      {{{"/v/a", 1, {"x", "y"}}, {"/v/a", 2, {"y", "z"}}}, "/v/a y "},
      {{{"/v/a", 1}, {"/v/a/volume", 1}}, "/v/a /v/a/volume "},
  };
  for (const auto& row : kRows) {
    SCOPED_TRACE(row.roots);
    std::string text;
    const auto same_mount = [](const std::string&, const std::string& inner) {
      return inner.find("volume") == std::string::npos;
    };
    for (const WatchRoot& root : WatchRoots({{"test", "/queue", row.watches}}, same_mount)) {
      text += root.path + " ";
      for (const std::string& name : root.ignore) text += name + " ";
    }
    EXPECT_EQ(text, row.roots);
  }
}

TEST(MountTableTest, TellsWhatLiesOnWhatAndWhatIsBehindANetwork) {
  const test::TempDir dir;
  test::WriteFile(dir / "mounts",
                  "20 1 8:1 / / rw - ext4 /dev/a rw\n"
                  "31 20 0:40 / /srv/my\\040files rw shared:1 - nfs4 host:/ rw\n"
                  "32 31 8:2 / /srv/my\\040files/local rw - xfs /dev/b rw\n"
                  "nonsense\n");
  const MountTable table((dir / "mounts").c_str());
  EXPECT_EQ(table.Find(32).beneath, (std::vector<uint64_t>{31, 20}));
  EXPECT_TRUE(table.IsMounted(table.Find(32)));
  EXPECT_FALSE(table.IsMounted({31, "8:9 / /srv/other"})) << "its number was given to another one";
  const std::pair<const char*, uint64_t> kPaths[] = {
      {"/srv/my files/a", 31}, {"/srv/my files/local/a", 32}, {"/srv/my filesystem", 20}, {"/", 20}};
  for (const auto& [path, id] : kPaths) EXPECT_EQ(table.MountOf(path), id) << path;
  EXPECT_TRUE(table.IsNetwork(31));
  EXPECT_FALSE(table.IsNetwork(32));
}

class MountTest : public WatchSetTest {
 protected:
  /// What is reported after each of: mounted, unmounted, mounted again, unmounted and mounted at once.
  std::string Walk(const std::string& root) {
    std::string reported;
    const auto step = [&](const char* name, bool done) {
      Examine();
      reported += std::string(name) + (done ? ": " : " failed: ") + Reported();
    };
    const auto mounted = [&] {
      return mount("none", root_.c_str(), "tmpfs", 0, nullptr) == 0 && (fs::create_directories(root), true);
    };
    const bool first = mounted();
    Follow({root});
    step("mounted", first);
    step("unmounted", umount(root_.c_str()) == 0);
    step("again", mounted());
    step("at once", umount(root_.c_str()) == 0 && mounted());
    return reported;
  }
};

TEST_F(MountTest, AVolumeThatGoesIsNoDeletionAndOneThatComesIsCompared) {
  for (const std::string name : {"", "/share"}) {
    const std::string reported = "compare /root" + name + " ";
    const std::string all = "mounted: " + reported + "unmounted: again: " + reported + "at once: " + reported;
    if (!test::InChild(true, [&] { EXPECT_EQ(Walk(root_ + name), all); })) GTEST_SKIP() << "no right to mount";
  }
}

TEST_F(MountTest, WhatAMountBelowAFolderHidesAndShowsAgainIsCompared) {
  const std::string point = root_ + "/sub/point";
  fs::create_directories(point + "/registered");
  const auto walk = [&](const std::vector<std::string>& registered) {
    Follow(registered);
    (void)Reported();
    std::string reported = mount("none", point.c_str(), "tmpfs", 0, nullptr) == 0 ? "" : "failed ";
    Examine();
    reported += "mounted: " + Reported();
    (void)umount(point.c_str());
    Examine();
    return reported + "unmounted: " + Reported();
  };
  const std::string compared = "compare /root/sub/point ";
  if (!test::InChild(true, [&] {
        EXPECT_EQ(walk({root_}), "mounted: " + compared + "unmounted: " + compared);
        EXPECT_EQ(walk({dir_ / "root/other"}), "mounted: unmounted: ");
        EXPECT_EQ(walk({root_, point + "/registered"}).find("point "), std::string::npos) << "it went with its volume";
      })) {
    GTEST_SKIP() << "no right to mount";
  }
}

}  // namespace
}  // namespace ferrox::notifyd
