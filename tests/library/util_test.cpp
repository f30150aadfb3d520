#include "fileindex/util.h"

#include <algorithm>
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

size_t CountOf(FileType type) {
  size_t count = 0;
  for (const auto& entry : GetExtensionMap()) count += entry.second == type;
  return count;
}

}  // namespace

TEST_F(UtilTest, SharePathsAndFullPaths) {
  for (const auto& [path, name] :
       {std::pair{"/photo", "photo"}, {"/photo/", "photo"}, {"/photo/a/b", "photo"}, {"/", ""}, {"//x", ""}}) {
    EXPECT_EQ(GetShareNameByPath(path), name) << path;
  }
  for (const char* bad : {"", "photo/a"}) {
    EXPECT_EQ(FailureOf([&] { GetShareNameByPath(bad); }), "120 ") << bad;
  }
  EXPECT_TRUE(log_.Contains("Failed [1 > share_path.size() || '/' != share_path.at(0)]"));
  EXPECT_EQ(GetFullPath("/photo/folder/b"), share_ + "/folder/b");
  EXPECT_EQ(FailureOf([] { GetFullPath("/nope/b"); }), "800 nope");
  std::string name, path;
  GetShareNamePathByFullPath(name, path, share_ + "/folder");
  EXPECT_EQ(name + " " + path, "photo /photo/folder");
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
  EXPECT_TRUE(log_.Contains("Failed [string::npos == pos]"));
}

TEST_F(UtilTest, KindsByExtension) {
  EXPECT_EQ(GetExtensionMap().size(), 735U);
  EXPECT_EQ(CountOf(FILE_TYPE_DOCUMENT), 646U);
  EXPECT_EQ(CountOf(FILE_TYPE_AUDIO), 25U);
  EXPECT_EQ(CountOf(FILE_TYPE_VIDEO), 31U);
  EXPECT_EQ(CountOf(FILE_TYPE_IMAGE), 33U);
  for (const auto& entry : GetExtensionMap()) {
    EXPECT_EQ(GetFileTypeByFullPath("/x.d/f." + std::string(entry.first)), entry.second) << entry.first;
  }
  for (const auto& [path, type] : {std::pair{"/p/a.JPG", FILE_TYPE_IMAGE},
                                   {"/p/Makefile", FILE_TYPE_DOCUMENT},
                                   {"/p/end.", FILE_TYPE_DOCUMENT},
                                   {"/p.mp3/readme", FILE_TYPE_DOCUMENT},
                                   {"/p/a.tar.gz", FILE_TYPE_DOCUMENT},
                                   {"/p/x.unknownext", FILE_TYPE_OTHER},
                                   {"/p/.mp3", FILE_TYPE_AUDIO},
                                   {"/p/x.adiumhtmllogadiumhtmllog", FILE_TYPE_OTHER},
                                   {"", FILE_TYPE_DOCUMENT},
                                   {"/p/x.mpg", FILE_TYPE_VIDEO},
                                   {"/p/x.q&a", FILE_TYPE_DOCUMENT},
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
    for (size_t i = 0; text >> word; ++i) {
      EXPECT_EQ(word == "OR", i % 2 == 1) << kind << " " << word;
      EXPECT_TRUE(type == FILE_TYPE_DOCUMENT || word == "OR" || GetExtensionMap().at(word) == type) << word;
    }
    EXPECT_EQ(std::count(queries.at(kind).begin(), queries.at(kind).end(), ' ') / 2 + 1U, words) << kind;
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
           Row{"type 12", [&] { platform_.fs_types[share_] = 12; }},
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
  SetUp();
  EXPECT_EQ(FailureOf([&] { CanFullPathBeIndexed(volume_); }), "502 KOVAShareNamePathGet failed, full_path=" + volume_);
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
  for (const char* name : {".ds_store", "a.jpg", "", ".DS_Store "}) EXPECT_FALSE(IsSystemPreservedFileName(name));
}

TEST_F(UtilTest, NotificationsRunTheNotifier) {
  SendZEMNotify();
  platform_.exec_status = -1;
  EXPECT_NO_THROW(NotifyLackOfMemory());
  ASSERT_EQ(platform_.executed.size(), 2U);
  for (const test::FakeProgram& program : platform_.executed) {
    EXPECT_EQ(program.path, "/usr/kova/bin/kovazemnotify");
    EXPECT_EQ(program.options, 187U);
  }
  EXPECT_EQ(
      platform_.executed[0].arguments,
      (std::vector<std::string>{"-c", "KOVA.Ferrox.Application", "-b", "true", "-e", "false", "@administrators",
                                "app:displayname", "error:index_no_space",
                                "<a data-kova-app=\"KOVA.Ferrox.Application\" data-kova-fn=\"preference\">", "</a>"}));
  EXPECT_EQ(platform_.executed[1].arguments,
            (std::vector<std::string>{"-c", "KOVA.Ferrox.Application", "@administrators", "app:displayname",
                                      "error:lack_of_memory"}));
}

}  // namespace ferrox::fileindex
