#include "fileindex/folder_mgr.h"

#include <signal.h>
#include <sys/resource.h>
#include <unistd.h>

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

/// A folder with the kinds named by their first letters: "da" has documents and audio.
FolderPtr NewFolder(const std::string& path, const std::string& kinds = "") {
  const auto has = [&kinds](char kind) { return kinds.find(kind) != std::string::npos; };
  return newClass<Folder>(path, "n", has('d'), has('a'), has('v'), has('p'), false, false);
}

/// "path kinds", "none" for null.
std::string Text(const FolderPtr& folder) {
  if (folder == nullptr) return "none";
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
  /// A folders file with entries of these paths and the kind "photo".
  void Write(const std::vector<std::string>& paths) {
    Json::Value folders(Json::arrayValue);
    for (const std::string& path : paths) folders.append(NewFolder(path, "p")->GetData());
    test::WriteFile(path_, toString(folders));
  }
  size_t LinesWith(const std::string& text) const {
    size_t count = 0;
    for (const std::string& line : log_.Lines()) count += line.find(text) != std::string::npos ? 1 : 0;
    return count;
  }

  const std::string path_ = InstancePath(kFileIndexFoldersCfgPath);
};

}  // namespace

TEST_F(FolderMgrTest, WhatWasSavedIsLoaded) {
  EXPECT_TRUE(FolderMgr().GetFolders().empty()) << "no file";
  FolderMgr().Save();
  EXPECT_EQ(test::ReadFile(path_), "[]\n");
  fs::permissions(path_, fs::perms(0600));
  platform_.users["web"] = {33, 33, false, "", 0};
  platform_.euid = platform_.egid = 33;
  FolderMgr mgr;
  EXPECT_EQ(Upserted(mgr, "/photo/\xff \"x\"", "dp"), "/photo/\xff \"x\" davp");
  EXPECT_EQ(Upserted(mgr, "/music", "a"), "/music davp");
  platform_.switches.clear();
  mgr.Save();
  EXPECT_EQ(platform_.switches, (std::vector<std::string>{"root", "web"}));
  EXPECT_EQ(fs::status(path_).permissions(), fs::perms(0644));
  EXPECT_EQ(test::Parse(test::ReadFile(path_))[1], NewFolder("/music", "a")->GetData());
  EXPECT_EQ(Paths(FolderMgr().GetFolders()), "/photo/\xff \"x\" /music ");
}

TEST_F(FolderMgrTest, UnusableFilesCannotBeLoaded) {
  for (const char* bad : {"", "{", "[] x", "{}", "7", "\"a\""}) {
    test::WriteFile(path_, bad);
    errno = 0;
    EXPECT_EQ(FailureOf([] { FolderMgr(); }), "504 Cannot load json: " + path_) << bad;
    EXPECT_NE(log_.Lines().back().find("(FolderMgr) Failed [IsFileExist(kFileIndexFoldersCfgPath) && "
                                       "!folders.fromFile(kFileIndexFoldersCfgPath)], reason: Cannot load json: " +
                                       path_),
              std::string::npos)
        << log_.Lines().back();
  }
  for (const char* bad : {"[7]", R"([{"path":"/photo","name":"n"}])", "[[]]"}) {
    test::WriteFile(path_, bad);
    EXPECT_EQ(FailureOf([] { FolderMgr(); }).substr(0, 3), "120") << bad;
  }
  test::WriteFile(path_, "null");
  EXPECT_TRUE(FolderMgr().GetFolders().empty());
}

// A limit on the size of files stands for the full disk.
TEST_F(FolderMgrTest, AFailedSaveLeavesTheOldFile) {
  Write({"/photo"});
  const std::string before = test::ReadFile(path_);
  FolderMgr mgr;
  (void)Upserted(mgr, "/music", "a");
  const auto save = [&mgr] { mgr.Save(); };
  struct rlimit unlimited = {};
  (void)signal(SIGXFSZ, SIG_IGN);
  ASSERT_EQ(getrlimit(RLIMIT_FSIZE, &unlimited), 0);
  for (const rlim_t room : {0, 10, 200}) {
    const struct rlimit tight = {room, unlimited.rlim_max};
    ASSERT_EQ(setrlimit(RLIMIT_FSIZE, &tight), 0);
    EXPECT_EQ(FailureOf(save), "505 " + path_);
    ASSERT_EQ(setrlimit(RLIMIT_FSIZE, &unlimited), 0);
    EXPECT_EQ(test::ReadFile(path_), before);
    EXPECT_FALSE(fs::exists(path_ + ".new"));
  }
  EXPECT_EQ(LinesWith("(Save) Failed [!folders.toFile(kFileIndexFoldersCfgPath)], reason: " + path_ + " [err: "), 3U);
  fs::permissions(fs::path(path_).parent_path(), fs::perms(0555));
  if (geteuid() != 0) {
    EXPECT_EQ(FailureOf(save), "505 " + path_);
  }
  fs::permissions(fs::path(path_).parent_path(), fs::perms(0755));
  platform_.failing["ResetCredentialsByName"] = {};
  EXPECT_EQ(FailureOf(save), "503 ");
  EXPECT_EQ(test::ReadFile(path_), before);
  platform_.failing.clear();
  save();
  EXPECT_EQ(Paths(FolderMgr().GetFolders()), "/photo /music ");
}

TEST_F(FolderMgrTest, TheDeepestFolderGoverns) {
  FolderMgr mgr;
  (void)Upserted(mgr, "/photo/a", "dp");
  (void)Upserted(mgr, "/photo/a/b", "v");
  struct Row {
    const char* path;
    const char* folder;
    bool need_meta;
  };
  for (const Row& row :
       {Row{"/v/photo/a/b/x.mp4", "/photo/a/b v", true}, Row{"/v/photo/a/b/x.txt", "/photo/a/b v", false},
        Row{"/v/photo/a/b", "/photo/a/b v", false}, Row{"/v/photo/a/bc/x.txt", "/photo/a dp", true},
        Row{"/v/photo/a/x.jpg", "/photo/a dp", true}, Row{"/v/photo/a/x.mp3", "/photo/a dp", false},
        Row{"/v/photo/a/b/x.unknown", "/photo/a/b v", true}, Row{"/v/photo/a//b", "/photo/a dp", true},
        Row{"/v/photo", "none", false}, Row{"/photo/a", "none", false}, Row{"", "none", false}}) {
    SCOPED_TRACE(row.path);
    EXPECT_EQ(Text(mgr.GetMostSuitableCfg(row.path)), row.folder);
    EXPECT_EQ(mgr.IsFullPathIndexed(row.path), std::string(row.folder) != "none");
    EXPECT_EQ(mgr.IsFullPathNeedMeta(row.path), row.need_meta);
    EXPECT_EQ(mgr.IsFullPathHasOwnCfg(row.path), std::string(row.path) == "/v/photo/a/b");
  }
}

TEST_F(FolderMgrTest, ChangesNameTheKindsThatDiffer) {
  FolderMgr mgr;
  EXPECT_EQ(Upserted(mgr, "/photo/a", "dp"), "/photo/a davp") << "nothing governed it";
  EXPECT_EQ(Upserted(mgr, "/photo/a", "d"), "/photo/a p");
  EXPECT_EQ(Upserted(mgr, "/photo/a", "d"), "/photo/a ");
  EXPECT_EQ(Upserted(mgr, "/photo/a/b/c", "dv"), "/photo/a/b/c v") << "against the nearest folder above";
  EXPECT_EQ(Upserted(mgr, "/photo/a/b", "a"), "/photo/a/b da");
  EXPECT_EQ(Upserted(mgr, "/photo/a", "d"), "/photo/a ");
  EXPECT_EQ(Paths(mgr.GetFolders()), "/photo/a/b/c /photo/a/b /photo/a ") << "a replaced entry stands last";
  EXPECT_EQ(Deleted(mgr, "/photo/a/b"), "/photo/a/b da");
  EXPECT_EQ(Deleted(mgr, "/photo/a"), "/photo/a davp");
  errno = 0;
  EXPECT_EQ(FailureOf([&] { Deleted(mgr, "/photo/a"); }), "902 /photo/a");
  EXPECT_NE(log_.Lines().back().find("Failed [it == folders_.end()], reason: /photo/a"), std::string::npos);
  EXPECT_FALSE(mgr.HasFolder("/photo/a/"));
  FolderPtr folder;
  EXPECT_EQ(FailureOf([&] { mgr.Get(folder, "/photo/a/b/c/"); }), "902 /photo/a/b/c/");
  EXPECT_EQ(FailureOf([&] { Upserted(mgr, "/gone/a", "d"); }), "800 gone");
  EXPECT_EQ(FailureOf([&] { Upserted(mgr, "photo", "d"); }), "120 ");
  EXPECT_EQ(Paths(mgr.GetFolders()), "/photo/a/b/c ");
}

TEST_F(FolderMgrTest, OfTwoEntriesOfOnePathTheFirstCounts) {
  Write({"/photo", "/music", "/photo", "/photo/"});
  FolderMgr mgr;
  FolderPtr first;
  mgr.Get(first, "/photo");
  EXPECT_EQ(first, mgr.GetFolders()[0]);
  EXPECT_EQ(mgr.GetMostSuitableCfg("/v/photo/x"), first);
  EXPECT_EQ(Text(mgr.GetMostSuitableCfg("/v/photo//x")), "/photo/ p") << "a folder of its own";
  EXPECT_EQ(Deleted(mgr, "/photo"), "/photo davp");
  EXPECT_EQ(Paths(mgr.GetFolders()), "/music /photo/ ");
  EXPECT_FALSE(mgr.IsFullPathIndexed("/v/photo/x"));
}

TEST_F(FolderMgrTest, EntriesWithoutAShareGovernNothing) {
  Write({"/gone/a", "", "/gone/b", "photo", "/photo/a"});
  FolderMgr mgr;
  for (int i = 0; i < 3; ++i) {
    EXPECT_TRUE(mgr.IsFullPathIndexed("/v/photo/a/x"));
    EXPECT_FALSE(mgr.IsFullPathIndexed("/v/gone/a"));
  }
  EXPECT_EQ(LinesWith("govern nothing"), 1U);
  EXPECT_TRUE(log_.Contains(": /gone/a  /gone/b photo")) << "all of them are named";
  EXPECT_EQ(mgr.GetIndexedShares(), (std::set<std::string>{"gone", "photo"}));
  EXPECT_TRUE(mgr.IsShareIndexed("gone"));
  EXPECT_FALSE(mgr.IsShareIndexed("gon") || mgr.IsShareIndexed("photo/a") || mgr.IsShareIndexed(""));
  EXPECT_EQ(Deleted(mgr, "/gone/b"), "/gone/b davp");
  EXPECT_EQ(Deleted(mgr, ""), " davp");
  mgr.DeleteByShare("gone");
  EXPECT_EQ(Paths(mgr.GetFolders()), "photo /photo/a ");
  EXPECT_EQ(platform_.CallCount("KOVAShareGet"), 2) << "each share is looked up once";
}

// "Not indexed" makes documents go: a share table that cannot be read must not say it.
TEST_F(FolderMgrTest, APlatformThatFailsIsNoAnswer) {
  Write({"/photo"});
  const FolderMgr mgr;
  platform_.failing["KOVAShareGet"] = {};
  EXPECT_EQ(FailureOf([&mgr] { (void)mgr.IsFullPathIndexed("/v/photo/x"); }), "800 photo");
  platform_.failing.clear();
  EXPECT_TRUE(mgr.IsFullPathIndexed("/v/photo/x"));
}

TEST_F(FolderMgrTest, AThousandFoldersAndNoMore) {
  FolderMgr mgr;
  for (int i = 0; i < 1000; ++i) (void)Upserted(mgr, "/photo/" + std::to_string(i), "d");
  EXPECT_EQ(FailureOf([&] { Upserted(mgr, "/photo/0", "p"); }), "") << "a replacement";
  EXPECT_EQ(FailureOf([&] { Upserted(mgr, "/music", "p"); }), "900 ");
  EXPECT_TRUE(log_.Contains("(Upsert) Failed [folders_.size() > kFileIndexFoldersMax], reason: "));
  EXPECT_EQ(platform_.CallCount("KOVAShareGet"), 2) << "each share is looked up once";
}

TEST_F(FolderMgrTest, ListGivesSortedPages) {
  FolderMgr mgr;
  for (const char* path : {"/photo/c", "/photo/B", "/photo/b", "/photo/a"}) {
    (void)Upserted(mgr, path, path[7] == 'c' || path[7] == 'b' ? "a" : "v");
  }
  struct Row {
    unsigned int offset, limit;
    const char *sort_by, *direction, *paths;
  };
  for (const Row& row :
       {Row{0, 9, "path", "asc", "/photo/B /photo/a /photo/b /photo/c "},
        Row{1, 2, "path", "desc", "/photo/b /photo/a "}, Row{0, 9, "audio", "", "/photo/c /photo/b /photo/B /photo/a "},
        Row{0, 9, "audio", "desc", "/photo/a /photo/B /photo/b /photo/c "},
        Row{0, 9, "video", "DESC", "/photo/B /photo/a /photo/c /photo/b "},
        Row{0, 9, "name", "desc", "/photo/a /photo/b /photo/B /photo/c "}, Row{0, 0, "path", "", ""},
        Row{4, 1, "", "", ""}, Row{4000000000U, 4000000000U, "", "", ""}}) {
    SCOPED_TRACE(std::string(row.sort_by) + " " + row.direction);
    std::vector<FolderPtr> page;
    unsigned int total = 0;
    mgr.List(page, total, row.offset, row.limit, row.sort_by, row.direction);
    EXPECT_EQ(Paths(page), row.paths);
    EXPECT_EQ(total, 4U);
  }
}

namespace {

/// The rule as it is written down: the longest entry at or above the path, of equal ones the first.
FolderPtr Naive(const std::vector<FolderPtr>& folders, const std::string& full_path) {
  FolderPtr best;
  for (const FolderPtr& folder : folders) {
    const bool governs = ferrox::StringStartWith(full_path + "/", "/v" + folder->GetPath() + "/");
    if (governs && (best == nullptr || folder->GetPath().size() > best->GetPath().size())) best = folder;
  }
  return best;
}

/// A path of few different components, some of them empty, some beginnings of others.
std::string RandomPath(std::mt19937& random) {
  std::string path = random() % 2 == 0 ? "/photo" : "/music";
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
  for (int round = 0; round < 30; ++round) {
    std::vector<std::string> paths(random() % 20);
    for (std::string& path : paths) path = RandomPath(random);
    Write(paths);
    FolderMgr mgr;
    for (int step = 0; step < 60; ++step) {
      const std::string path = RandomPath(random);
      const FolderPtr before = Naive(mgr.GetFolders(), "/v" + path);
      ASSERT_EQ(mgr.GetMostSuitableCfg("/v" + path), before) << path;
      if (const unsigned dice = random() % 10; dice < 3) {
        const FolderPtr folder = NewFolder(path, dice == 0 ? "d" : "av");
        ASSERT_EQ(Upserted(mgr, path, dice == 0 ? "d" : "av"), Text(FolderMgr::DiffCfg(folder, before)));
      } else if (dice < 6 && mgr.HasFolder(path)) {
        const std::string change = Deleted(mgr, path);
        ASSERT_EQ(change, Text(FolderMgr::DiffCfg(before, Naive(mgr.GetFolders(), "/v" + path))));
      } else if (dice == 9 && random() % 8 == 0) {
        mgr.DeleteByShare("music");
        ASSERT_FALSE(mgr.IsShareIndexed("music"));
      }
    }
  }
}

}  // namespace ferrox::fileindex
