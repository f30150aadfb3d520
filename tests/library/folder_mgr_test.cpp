// Catches the wrong folder governing a path, kinds that change unsaid, and a list that a failed save destroys.
#include "fileindex/folders/folder_mgr.h"

#include <fcntl.h>
#include <signal.h>
#include <sys/resource.h>
#include <sys/stat.h>

#include <cerrno>
#include <random>

#include "common/file_util.h"
#include "common/new_class.h"
#include "tests/support/library_test.h"

namespace ferrox::fileindex {

namespace {

namespace fs = std::filesystem;
using test::FailureOf;
using FolderPtr = std::shared_ptr<Folder>;

bool chmod_fails = false;

/// A folder with the kinds named by their first letters: "da" has documents and audio.
FolderPtr NewFolder(const std::string& path, const std::string& kinds) {
  const auto has = [&kinds](char kind) { return kinds.find(kind) != std::string::npos; };
  return newClass<Folder>(path, "n", has('d'), has('a'), has('v'), has('p'), false, false);
}

std::string Text(const FolderPtr& folder) {
  return folder->GetPath() + " " + (folder->IsDocument() ? "d" : "") + (folder->IsAudio() ? "a" : "") +
         (folder->IsVideo() ? "v" : "") + (folder->IsPhoto() ? "p" : "");
}

std::string Upserted(FolderMgr& mgr, const std::string& path, const std::string& kinds) {
  FolderPtr change;
  mgr.Upsert(change, NewFolder(path, kinds));
  return Text(change);
}
std::string Deleted(FolderMgr& mgr, const std::string& path) {
  FolderPtr change;
  mgr.Delete(change, path);
  return Text(change);
}
std::string Paths(const std::vector<FolderPtr>& folders) {
  std::string text;
  for (const FolderPtr& folder : folders) text += folder->GetPath() + " ";
  return text;
}

class FolderMgrTest : public test::LibraryTest {
 protected:
  void SetUp() override {
    fs::remove_all(path_);
    for (const char* share : {"photo", "music"}) platform_.shares[share].path = std::string("/v/") + share;
  }
  /// A folders file with these paths.
  void Write(const std::vector<std::string>& paths) {
    Json::Value folders(Json::arrayValue);
    for (const std::string& path : paths) folders.append(NewFolder(path, "p")->GetData());
    test::WriteFile(path_, toString(folders));
  }

  const std::string path_ = InstancePath(kFileIndexFoldersCfgPath);
};

}  // namespace

// In place of the C library's in this program.
extern "C" int chmod(const char* path, mode_t mode) noexcept {
  errno = EPERM;
  return chmod_fails ? -1 : fchmodat(AT_FDCWD, path, mode, 0);
}

TEST_F(FolderMgrTest, WhatWasSavedIsLoaded) {
  FolderMgr().Save();
  EXPECT_EQ(test::ReadFile(path_), "[]\n");
  fs::permissions(path_, fs::perms(0600));
  platform_.users["web"] = {33, 33, false, "", 0};
  platform_.euid = platform_.egid = 33;
  platform_.switches.clear();
  FolderMgr mgr;
  (void)Upserted(mgr, "/photo/\xff \"x\"", "dp");
  (void)Upserted(mgr, "/music", "a");
  mgr.Save();
  EXPECT_EQ(platform_.switches, (std::vector<std::string>{"root", "web"}));
  EXPECT_EQ(fs::status(path_).permissions(), fs::perms(0644));
  EXPECT_EQ(test::Parse(test::ReadFile(path_))[1], NewFolder("/music", "a")->GetData());
  EXPECT_EQ(Paths(FolderMgr().GetFolders()), "/photo/\xff \"x\" /music ");
}

TEST_F(FolderMgrTest, UnusableFilesCannotBeLoaded) {
  for (const char* bad : {"", "[] x", "{}", "\"a\""}) {
    test::WriteFile(path_, bad);
    EXPECT_EQ(FailureOf([] { FolderMgr(); }), "504 Cannot load json: " + path_) << bad;
    EXPECT_TRUE(
        log_.Contains("(FolderMgr) Failed [IsFileExist(kFileIndexFoldersCfgPath) && "
                      "!folders.fromFile(kFileIndexFoldersCfgPath)], reason: Cannot load json: /"));
  }
  test::WriteFile(path_, "[[]]");
  EXPECT_EQ(FailureOf([] { FolderMgr(); }).substr(0, 20), "120 Not an object, d");
  test::WriteFile(path_, "null");
  EXPECT_TRUE(FolderMgr().GetFolders().empty());
}

// A limit on the size of files stands for the full disk.
TEST_F(FolderMgrTest, AFailedSaveLeavesTheOldFileOrTheNew) {
  Write({"/photo"});
  const std::string before = test::ReadFile(path_);
  FolderMgr mgr;
  (void)Upserted(mgr, "/music", "a");
  const auto save = [&mgr] { mgr.Save(); };
  struct rlimit unlimited = {};
  (void)signal(SIGXFSZ, SIG_IGN);
  ASSERT_EQ(getrlimit(RLIMIT_FSIZE, &unlimited), 0);
  const struct rlimit tight = {200, unlimited.rlim_max};
  ASSERT_EQ(setrlimit(RLIMIT_FSIZE, &tight), 0);
  EXPECT_EQ(FailureOf(save), "505 " + path_);
  EXPECT_TRUE(log_.Contains("(Save) Failed [!folders.toFile(kFileIndexFoldersCfgPath)], reason: " + path_ + " [err: "));
  ASSERT_EQ(setrlimit(RLIMIT_FSIZE, &unlimited), 0);
  EXPECT_FALSE(fs::exists(path_ + ".new"));
  EXPECT_EQ(test::ReadFile(path_), before);
  chmod_fails = true;
  EXPECT_EQ(FailureOf(save), "502 " + path_);
  EXPECT_TRUE(log_.Contains("Failed [-1 == chmod(kFileIndexFoldersCfgPath, 0644)], reason: " + path_ + " [err: "));
  chmod_fails = false;
  EXPECT_EQ(Paths(FolderMgr().GetFolders()), "/photo /music ");
}

TEST_F(FolderMgrTest, TheDeepestFoldersKindsDecide) {
  FolderMgr mgr;
  (void)Upserted(mgr, "/photo/a", "dp");
  (void)Upserted(mgr, "/photo/a/b", "av");
  std::string wanted;
  for (const std::string name : {"a/x.jpg", "a/bc/x.txt", "a/x.mp3", "a/x.mp4", "a/b/x.mp4", "a/b/x.MP3",
                                 "a/b/x.unknown", "a/b/x.txt", "a/b", "a/b/x.jpg", "x.txt"}) {
    if (mgr.IsFullPathNeedMeta("/v/photo/" + name)) wanted += name + " ";
  }
  EXPECT_EQ(wanted, "a/x.jpg a/bc/x.txt a/b/x.mp4 a/b/x.MP3 a/b/x.unknown ");
}

TEST_F(FolderMgrTest, ChangesNameTheKindsThatDiffer) {
  FolderMgr mgr;
  EXPECT_EQ(Upserted(mgr, "/photo/a", "dp"), "/photo/a davp");
  EXPECT_EQ(Upserted(mgr, "/photo/a/b/c", "dv"), "/photo/a/b/c vp") << "against the nearest folder above";
  EXPECT_EQ(Upserted(mgr, "/photo/a", "d"), "/photo/a p");
  EXPECT_EQ(Upserted(mgr, "/photo/a", "d"), "/photo/a ");
  EXPECT_EQ(Paths(mgr.GetFolders()), "/photo/a/b/c /photo/a ") << "a replaced entry stands last";
  EXPECT_EQ(Deleted(mgr, "/photo/a/b/c"), "/photo/a/b/c v");
  EXPECT_EQ(FailureOf([&mgr] { Deleted(mgr, "/photo/a/"); }), "902 /photo/a/");
  EXPECT_TRUE(log_.Contains("(Get) Failed [it == folders_.end()], reason: /photo/a/"));
  EXPECT_EQ(FailureOf([&mgr] { Upserted(mgr, "/gone/a", "d"); }), "800 gone");
  EXPECT_EQ(FailureOf([&mgr] { Upserted(mgr, "photo", "d"); }), "120 ");
  EXPECT_EQ(Deleted(mgr, "/photo/a"), "/photo/a davp");
  EXPECT_TRUE(mgr.GetFolders().empty());
}

TEST_F(FolderMgrTest, EntriesWithoutAShareGovernNothing) {
  Write({"/gone/a", "", "/gone/b", "photo", "/photo/a"});
  FolderMgr mgr;
  // "Not indexed" makes documents go: a platform that fails must not say it.
  platform_.failing["KOVAShareGet"] = {};
  EXPECT_EQ(FailureOf([&mgr] { (void)mgr.IsFullPathIndexed("/v/photo/a"); }), "800 gone");
  platform_.failing.clear();
  platform_.calls.clear();
  log_.Lines().clear();
  EXPECT_TRUE(mgr.IsFullPathIndexed("/v/photo/a/x"));
  EXPECT_FALSE(mgr.IsFullPathIndexed("/v/gone/a"));
  EXPECT_EQ(log_.Lines().size(), 2U) << "the share, and once the entries";
  EXPECT_TRUE(log_.Contains(": /gone/a  /gone/b photo"));
  EXPECT_EQ(mgr.GetIndexedShares(), (std::set<std::string>{"gone", "photo"}));
  EXPECT_TRUE(mgr.IsShareIndexed("gone"));
  EXPECT_FALSE(mgr.IsShareIndexed("gon") || mgr.IsShareIndexed("photo/a") || mgr.IsShareIndexed(""));
  EXPECT_EQ(Deleted(mgr, "/gone/b") + Deleted(mgr, ""), "/gone/b davp davp");
  mgr.DeleteByShare("gone");
  EXPECT_EQ(Paths(mgr.GetFolders()), "photo /photo/a ");
  EXPECT_EQ(platform_.CallCount("KOVAShareGet"), 2) << "each share is looked up once";
}

TEST_F(FolderMgrTest, AThousandFoldersAndNoMore) {
  FolderMgr mgr;
  platform_.failing["KOVAShareGet"].times = 1;
  EXPECT_EQ(FailureOf([&mgr] { Upserted(mgr, "/photo/0", "d"); }), "800 photo");
  platform_.calls.clear();
  for (int i = 0; i < 1000; ++i) (void)Upserted(mgr, "/photo/" + std::to_string(i), "d");
  EXPECT_EQ(Upserted(mgr, "/photo/0", "p"), "/photo/0 dp") << "a replacement";
  EXPECT_EQ(FailureOf([&mgr] { Upserted(mgr, "/music", "p"); }), "900 ");
  EXPECT_EQ(platform_.CallCount("KOVAShareGet"), 2) << "each share is looked up once";
}

TEST_F(FolderMgrTest, ListGivesSortedPages) {
  FolderMgr mgr;
  const std::string letters = "ZYXWVUTSRQPONMcBba";  // more than a sort keeps in order by chance
  for (const char c : letters) (void)Upserted(mgr, std::string("/photo/") + c, c == 'c' || c == 'b' ? "a" : "");
  struct Row {
    unsigned int offset, limit;
    std::string sort_by, direction, letters;
  };
  for (const Row& row : {Row{0, 5, "path", "asc", "BMNOP"}, Row{1, 2, "path", "desc", "ba"},
                         Row{0, 99, "audio", "", "cbZYXWVUTSRQPONMBa"}, Row{0, 4, "audio", "desc", "aBMN"},
                         Row{0, 3, "audio", "DESC", "cbZ"}, Row{0, 99, "name", "", letters}, Row{0, 0, "path", "", ""},
                         Row{18, 1, "", "", ""}, Row{4000000000U, 4000000000U, "", "", ""}}) {
    std::vector<FolderPtr> page;
    unsigned int total = 0;
    mgr.List(page, total, row.offset, row.limit, row.sort_by, row.direction);
    std::string got;
    for (const FolderPtr& folder : page) got += folder->GetPath().back();
    EXPECT_EQ(got, row.letters) << row.sort_by << " " << row.direction;
    EXPECT_EQ(total, letters.size());
  }
}

namespace {

/// The share "b" lies in the share "photo".
std::string Full(const std::string& path) {
  return (ferrox::StringStartWith(path + "/", "/b/") ? "/v/photo" : "/v") + path;
}

/// The rule as it is written down: the longest entry at or above the path, of equal ones the first.
FolderPtr Naive(const std::vector<FolderPtr>& folders, const std::string& full_path) {
  FolderPtr best;
  for (const FolderPtr& folder : folders) {
    const bool governs = ferrox::StringStartWith(full_path + "/", Full(folder->GetPath()) + "/");
    if (governs && (best == nullptr || Full(folder->GetPath()).size() > Full(best->GetPath()).size())) best = folder;
  }
  return best;
}

/// A path of few different components, some of them empty, some beginnings of others.
std::string RandomPath(std::mt19937& random) {
  std::string path = std::array{"/photo", "/music", "/b"}[random() % 3];
  for (unsigned depth = random() % 5; depth > 0; --depth) {
    path += std::string("/") + std::array{"", "b", "bc", "b.d", "/"}[random() % 5];
  }
  return path;
}

}  // namespace

TEST_F(FolderMgrTest, LooksUpAsAScanOfTheListDoes) {
  const unsigned seed = std::random_device{}();
  SCOPED_TRACE(seed);
  std::mt19937 random(seed);
  platform_.shares["b"] = {"/v/photo/b"};
  for (int round = 0; round < 30; ++round) {
    std::vector<std::string> paths(random() % 20);
    for (std::string& path : paths) path = RandomPath(random);
    Write(paths);
    FolderMgr mgr;
    for (int step = 0; step < 60; ++step) {
      const std::string path = RandomPath(random);
      const FolderPtr before = Naive(mgr.GetFolders(), Full(path));
      ASSERT_EQ(mgr.GetMostSuitableCfg(Full(path)), before) << path;
      ASSERT_EQ(mgr.IsFullPathIndexed(Full(path)), before != nullptr) << path;
      ASSERT_EQ(mgr.IsFullPathHasOwnCfg(Full(path)), before != nullptr && Full(before->GetPath()) == Full(path));
      const unsigned dice = random() % 10;
      if (dice < 3) {
        ASSERT_EQ(Upserted(mgr, path, "av"), Text(FolderMgr::DiffCfg(NewFolder(path, "av"), before)));
      } else if (dice < 6 && mgr.HasFolder(path)) {
        FolderPtr entry;
        mgr.Get(entry, path);
        const std::string change = Deleted(mgr, path);
        ASSERT_FALSE(mgr.HasFolder(path)) << "all entries of the path are gone";
        ASSERT_EQ(change, Text(FolderMgr::DiffCfg(entry, Naive(mgr.GetFolders(), Full(path)))));
      } else if (random() % 50 == 0) {
        mgr.DeleteByShare(random() % 2 == 0 ? "music" : "b");
      }
    }
  }
}

}  // namespace ferrox::fileindex
