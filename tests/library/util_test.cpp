// Catches paths, kinds of files and exclusions that decide wrongly what is indexed.
#include "fileindex/util.h"

#include <sstream>

#include <kova/fs.h>

#include "fileindex/file_types.h"
#include "tests/support/library_test.h"

namespace ferrox::fileindex {

namespace {

namespace fs = std::filesystem;
using test::FailureOf;

class UtilTest : public test::LibraryTest {
 protected:
  void SetUp() override {
    platform_.Reset();
    fs::create_directories(share_ + "/folder");
    test::WriteFile(share_ + "/a.jpg", "x");
    platform_.shares["photo"] = {share_};
  }

  test::TempDir dir_;
  const std::string volume_ = fs::canonical(dir_.Path()).string();
  const std::string share_ = volume_ + "/photo";
};

}  // namespace

TEST_F(UtilTest, SharePathsAndFullPaths) {
  for (const auto& [path, name] :
       {std::pair{"/photo", "photo"}, {"/photo/", "photo"}, {"/photo/a/b", "photo"}, {"/", ""}, {"//x", ""}}) {
    EXPECT_EQ(GetShareNameByPath(path), name) << path;
  }
  for (const char* bad : {"", "photo/a"}) {
    EXPECT_EQ(FailureOf([&] { GetShareNameByPath(bad); }), "120 ") << bad;
  }
  EXPECT_EQ(GetFullPath("/photo/folder/b"), share_ + "/folder/b");
  EXPECT_EQ(FailureOf([] { GetFullPath("/nope/b"); }), "800 nope");
  std::string name, path;
  EXPECT_EQ(FailureOf([&] { GetShareNamePathByFullPath(name, path, volume_); }),
            "502 KOVAShareNamePathGet failed, full_path=" + volume_);
  std::string same = "/photo/x";
  GetFullPath(same, same);
  EXPECT_EQ(same, share_ + "/x");
}

TEST_F(UtilTest, ReplacePathShareTouchesOneComponent) {
  for (const auto& [path, expected] : {std::pair{"/old/a", "/new/a"},
                                       {"/old", "/new"},
                                       {"/volume1/old", "/volume1/new"},
                                       {"/volume1/old/old/x", "/volume1/new/old/x"},
                                       {"/old/", "/new/"}}) {
    EXPECT_EQ(ReplacePathShare(path, "new", "old"), expected) << path;
  }
  for (const char* bad : {"/volume1/older/x", "old/x", "", "/Old/x"}) {
    EXPECT_EQ(FailureOf([&] { ReplacePathShare(bad, "new", "old"); }), "120 Cannot find share: old") << bad;
  }
}

TEST_F(UtilTest, KindsByExtension) {
  std::map<FileType, int> counts;
  for (const auto& entry : GetExtensionMap()) {
    ++counts[entry.second];
    EXPECT_EQ(GetFileTypeByFullPath("/x.d/f." + std::string(entry.first)), entry.second) << entry.first;
  }
  EXPECT_EQ(counts,
            (std::map<FileType, int>{
                {FILE_TYPE_DOCUMENT, 646}, {FILE_TYPE_AUDIO, 25}, {FILE_TYPE_VIDEO, 31}, {FILE_TYPE_IMAGE, 33}}));
  for (const auto& [path, type] : {std::pair{"/p/a.JPG", FILE_TYPE_IMAGE},
                                   {"/p/Makefile", FILE_TYPE_DOCUMENT},
                                   {"/p/end.", FILE_TYPE_DOCUMENT},
                                   {"/p.mp3/readme", FILE_TYPE_DOCUMENT},
                                   {"/p/x.unknownext", FILE_TYPE_OTHER},
                                   {"/p/x.adiumhtmllogadiumhtmllog", FILE_TYPE_OTHER},
                                   {"", FILE_TYPE_DOCUMENT},
                                   {"/p/x.TX?", FILE_TYPE_DOCUMENT}}) {
    EXPECT_EQ(GetFileTypeByFullPath(path), type) << path;
  }
}

TEST_F(UtilTest, CategoryQueriesNameEveryExtensionOfTheirKind) {
  const auto& queries = GetCategoryQueries();
  ASSERT_EQ(queries.size(), 4U);
  for (const auto& [kind, words, type] : {std::tuple{"document", 89U, FILE_TYPE_DOCUMENT},
                                          {"audio", 25U, FILE_TYPE_AUDIO},
                                          {"video", 31U, FILE_TYPE_VIDEO},
                                          {"image", 33U, FILE_TYPE_IMAGE}}) {
    std::istringstream text(queries.at(kind));
    std::string word;
    size_t count = 0;
    for (; text >> word; ++count) {
      EXPECT_EQ(word == "OR", count % 2 == 1) << kind << " " << word;
      EXPECT_TRUE(type == FILE_TYPE_DOCUMENT || word == "OR" || GetExtensionMap().at(word) == type) << word;
    }
    EXPECT_EQ(count, 2 * words - 1) << kind;
  }
}

TEST_F(UtilTest, WhatCanBeIndexed) {
  EXPECT_TRUE(CanFullPathBeIndexed(share_ + "/a.jpg"));
  EXPECT_TRUE(CanPathBeIndexed("/photo/folder"));
  fs::create_symlink(share_ + "/folder", share_ + "/link");
  for (const char* path :
       {"/photo/missing", "/photo/folder/", "/photo//folder", "/photo/folder/../a.jpg", "/photo/link"}) {
    EXPECT_FALSE(CanPathBeIndexed(path)) << path;
  }
  struct Row {
    const char* what;
    std::function<void()> make;
    bool expected = false;
  };
  const std::string path = share_ + "/#snapshot #recycle";
  fs::create_directories(path);
  for (const Row& row : {
           Row{"snapshot", [&] { platform_.snapshots = {path}; }},
           Row{"unconfirmed snapshot", [&] { platform_.failing["KLIBFhsPathInSnapshot"] = {}; }, true},
           Row{"remote", [&] { platform_.fs_types[share_] = KOVA_FS_NFS; }},
           Row{"image", [&] { platform_.fs_types[share_] = KOVA_FS_SQUASHFS; }},
           Row{"no type", [&] { platform_.failing["KOVAGetFSType"] = {}; }},
           Row{"read-only share", [&] { platform_.shares["photo"].read_only = 1; }},
           Row{"locked share", [&] { platform_.shares["photo"].encrypted = 1; }},
           Row{"recycle bin", [&] { platform_.recycle_bins = {path}; }},
           Row{"mount point", [&] { platform_.mount_points = {path}; }},
           Row{"mount of an encrypted share",
               [&] { platform_.mount_points = {path}, platform_.shares["photo"].encryption = 1; }, true},
       }) {
    SetUp();
    row.make();
    EXPECT_EQ(CanFullPathBeIndexed(path), row.expected) << row.what;
  }
}

TEST_F(UtilTest, ShareRemovedWhileItIsAskedForLeavesItsFolderToTheOneAround) {
  platform_.shares["inner"] = {share_ + "/folder"};
  platform_.on_call = [&](const std::string& call) {
    if (call == "KOVAShareGet(inner)") platform_.shares.erase("inner");
  };
  EXPECT_TRUE(CanFullPathBeIndexed(share_ + "/folder"));
}

TEST_F(UtilTest, RecycleBins) {
  platform_.recycle_bins = {share_};
  EXPECT_TRUE(IsFullPathInRecycleBin(share_ + "/#recycle/a"));
  EXPECT_FALSE(IsFullPathInRecycleBin(share_ + "/bin/a")) << "only with that name";
  platform_.home_recycle_bins = {share_, volume_ + "/homes/ann/bin"};
  EXPECT_FALSE(IsFullPathInRecycleBin(share_ + "/bin/a")) << "only in homes";
  platform_.shares["homes"] = {volume_ + "/homes"};
  EXPECT_TRUE(IsFullPathInRecycleBin(volume_ + "/homes/ann/bin/a"));
  EXPECT_FALSE(IsFullPathInRecycleBin(volume_ + "/homes/ann/a"));
  EXPECT_TRUE(platform_.Called("KOVARecycleUserHomePathIsExist(" + volume_ + "/homes/ann/a, 11)"));
}

TEST_F(UtilTest, SystemNames) {
  for (const char* name : {".TemporaryItems", ".KOVAPPSDB", ".DS_Store"}) EXPECT_TRUE(IsSystemPreservedFileName(name));
  for (const char* name : {".ds_store", "", ".DS_Store "}) EXPECT_FALSE(IsSystemPreservedFileName(name));
}

TEST_F(UtilTest, NotificationsRunTheNotifier) {
  SendZEMNotify();
  platform_.exec_status = -1;
  EXPECT_NO_THROW(NotifyLackOfMemory());
  ASSERT_EQ(platform_.executed.size(), 2U);
  std::string arguments[2];
  for (const int i : {0, 1}) {
    EXPECT_EQ(platform_.executed[i].path, "/usr/kova/bin/kovazemnotify");
    EXPECT_EQ(platform_.executed[i].options, 187U);
    for (const std::string& argument : platform_.executed[i].arguments) arguments[i] += argument + "|";
  }
  EXPECT_EQ(arguments[0],
            "-c|KOVA.Ferrox.Application|-b|true|-e|false|@administrators|app:displayname|error:index_no_space|"
            "<a data-kova-app=\"KOVA.Ferrox.Application\" data-kova-fn=\"preference\">|</a>|");
  EXPECT_EQ(arguments[1], "-c|KOVA.Ferrox.Application|@administrators|app:displayname|error:lack_of_memory|");
}

}  // namespace ferrox::fileindex
