#include "common/file_util.h"

#include <sys/stat.h>
#include <sys/wait.h>
#include <unistd.h>

#include <filesystem>

#include <gtest/gtest.h>

#include <kova/fs.h>

#include "common/error.h"
#include "tests/support/fake_platform.h"
#include "tests/support/temp_dir.h"

namespace ferrox {

namespace {

namespace fs = std::filesystem;
using test::FakePlatform;
using test::ReadFile;
using test::TempDir;
using test::WriteFile;

class FileUtilTest : public testing::Test {
 protected:
  void SetUp() override { FakePlatform::Get().Reset(); }
  TempDir dir_;
};

}  // namespace

TEST_F(FileUtilTest, PathsAreCutAtTheLastSlash) {
  struct Row {
    const char *path, *base, *dirname, *extension, *lower;
  };
  for (const Row& row : {
           Row{"/v/s/a.JPG", "a.JPG", "/v/s", "JPG", "jpg"},
           Row{"/a", "a", "", "", ""},
           Row{"bare", "bare", "bare", "", ""},
           Row{"/v/s/", "", "/v/s", "", ""},
           Row{"/v.d/readme", "readme", "/v.d", "", ""},
           Row{"/v/.Hidden", ".Hidden", "/v", "Hidden", "hidden"},
           Row{"/v/a.tar.gz", "a.tar.gz", "/v", "gz", "gz"},
           Row{"/v/end.", "end.", "/v", "", ""},
           Row{"/v/x.\xc4\xd6Z", "x.\xc4\xd6Z", "/v", "\xc4\xd6Z", "\xc4\xd6z"},
           Row{"", "", "", "", ""},
       }) {
    SCOPED_TRACE(row.path);
    EXPECT_EQ(Basename(row.path), row.base);
    EXPECT_EQ(Dirname(row.path), row.dirname);
    EXPECT_EQ(GetFileExtension(row.path, false), row.extension);
    EXPECT_EQ(GetFileExtension(row.path, true), row.lower);
  }
  EXPECT_TRUE(StringStartWith("abc", ""));
  EXPECT_TRUE(StringStartWith("abc", "abc"));
  EXPECT_FALSE(StringStartWith("ab", "abc"));
  EXPECT_FALSE(StringStartWith("xabc", "abc"));
}

TEST_F(FileUtilTest, KindsOfEntries) {
  WriteFile(dir_ / "file", "x");
  fs::create_directory(dir_ / "folder");
  fs::create_symlink(dir_ / "file", dir_ / "to_file");
  fs::create_symlink(dir_ / "folder", dir_ / "to_folder");
  fs::create_symlink(dir_ / "to_folder", dir_ / "to_link");
  fs::create_symlink("folder", dir_ / "relative");
  fs::create_symlink(dir_ / "loop", dir_ / "loop");
  struct Row {
    const char* name;
    bool file, folder, folder_followed;
  };
  for (const Row& row :
       {Row{"file", true, false, false}, Row{"folder", false, true, true}, Row{"to_file", false, false, false},
        Row{"to_folder", false, false, true}, Row{"to_link", false, false, true}, Row{"loop", false, false, false},
        // A relative target counts from the working directory.
        Row{"relative", false, false, false}, Row{"missing", false, false, false}}) {
    SCOPED_TRACE(row.name);
    EXPECT_EQ(IsFileExist(dir_ / row.name), row.file);
    EXPECT_EQ(IsDirExist(dir_ / row.name, false), row.folder);
    EXPECT_EQ(IsDirExist(dir_ / row.name, true), row.folder_followed);
  }
  dirent entry = {};
  for (const auto& [type, expected] : {std::pair{DT_DIR, true}, {DT_REG, false}, {DT_UNKNOWN, false}}) {
    entry.d_type = static_cast<unsigned char>(type);
    EXPECT_EQ(IsDirentDir(entry, dir_ / "folder"), expected) << type;
  }
  EXPECT_EQ(RealPath(dir_ / "to_link/../folder/."), fs::canonical(dir_ / "folder").string());
  EXPECT_EQ(RealPath(dir_ / "missing"), "");
}

TEST_F(FileUtilTest, UnlinkOfAMissingFileIsNoFailure) {
  WriteFile(dir_ / "file", "x");
  EXPECT_TRUE(Unlink(dir_ / "file"));
  EXPECT_TRUE(Unlink(dir_ / "file"));
  EXPECT_FALSE(Unlink(dir_.Path()));
}

TEST_F(FileUtilTest, PlatformAnswersArePassedOn) {
  FakePlatform& platform = FakePlatform::Get();
  platform.permissions = {{"/p", KOVA_PERM_READ | KOVA_PERM_EXECUTE}};
  platform.mount_points = {"/mnt"};
  EXPECT_TRUE(CheckACLPerm("/p", KOVA_PERM_READ | KOVA_PERM_WRITE));
  EXPECT_FALSE(CheckACLPerm("/p", KOVA_PERM_WRITE));
  EXPECT_FALSE(CheckACLPerm("/no/such", KOVA_PERM_READ));
  EXPECT_TRUE(IsMountPoint("/mnt"));
  EXPECT_FALSE(IsMountPoint("/mnt/below"));
  WriteFile(dir_ / "a", "x");
  EXPECT_TRUE(CPFile(dir_ / "a", dir_ / "b"));
  EXPECT_TRUE(MVFile(dir_ / "a", dir_ / "c"));
  EXPECT_FALSE(MVFile(dir_ / "a", dir_ / "d"));
  EXPECT_TRUE(platform.Called("KOVAFileCopy(" + dir_ / "a" + ", " + dir_ / "b" + ", 10, 1)"));
  EXPECT_TRUE(platform.Called("KOVAFileCopy(" + dir_ / "a" + ", " + dir_ / "c" + ", 11, 1)"));
}

TEST_F(FileUtilTest, ChownNeedsThePackageUser) {
  WriteFile(dir_ / "a", "x");
  try {
    (void)ChownFerrox(dir_ / "a");
    FAIL() << "no such user, and no failure";
  } catch (const Error& error) {
    EXPECT_EQ(error.Code(), Error::kChownFailed);
    EXPECT_STREQ(error.what(), "");
  }
  FakePlatform::Get().users["Ferrox"] = {getuid(), getgid(), false, "/", 0};
  EXPECT_TRUE(ChownFerrox(dir_ / "a"));
  EXPECT_FALSE(ChownFerrox(dir_ / "missing"));
}

TEST_F(FileUtilTest, WholeFileIsTheOldOneOrTheNewOne) {
  const std::string path = dir_ / "f";
  std::string content;
  ASSERT_TRUE(WriteWholeFile(path, "old"));
  struct stat status = {};
  ASSERT_EQ(stat(path.c_str(), &status), 0);
  EXPECT_EQ(status.st_mode & 0777, 0644U);
  ASSERT_EQ(chmod(path.c_str(), 0600), 0);
  ASSERT_TRUE(WriteWholeFile(path, std::string("n\0w", 3)));
  ASSERT_EQ(stat(path.c_str(), &status), 0);
  EXPECT_EQ(status.st_mode & 0777, 0600U) << "the mode stays";
  EXPECT_TRUE(ReadWholeFile(path, content));
  EXPECT_EQ(content, std::string("n\0w", 3));

  fs::create_directory(dir_ / "d");  // cannot be renamed over
  WriteFile(dir_ / "d/in", "x");
  EXPECT_FALSE(WriteWholeFile(dir_ / "d", "new"));
  EXPECT_FALSE(IsFileExist(dir_ / "d.new")) << "nothing is left beside";
  fs::create_directory(dir_ / "f.new");  // the file beside cannot be made
  EXPECT_FALSE(WriteWholeFile(path, "newer"));
  EXPECT_EQ(ReadFile(path), std::string("n\0w", 3));
  EXPECT_FALSE(ReadWholeFile(dir_ / "d", content));
  ASSERT_EQ(mkfifo((dir_ / "fifo").c_str(), 0600), 0);
  EXPECT_FALSE(ReadWholeFile(dir_ / "fifo", content)) << "and does not wait for a writer";
}

TEST_F(FileUtilTest, KilledWritersLeaveNoHalfFile) {
  const std::string path = dir_ / "f";
  const std::string contents[] = {std::string(300000, 'a'), std::string(200000, 'b')};
  ASSERT_TRUE(WriteWholeFile(path, contents[0]));
  for (int round = 0; round < 20; ++round) {
    const pid_t writer = fork();
    if (writer == 0) {
      for (size_t i = 0;; ++i) (void)WriteWholeFile(path, contents[i % 2]);
    }
    (void)usleep(static_cast<useconds_t>(500 * round));
    (void)kill(writer, SIGKILL);
    (void)waitpid(writer, nullptr, 0);
    const std::string left = ReadFile(path);
    ASSERT_TRUE(left == contents[0] || left == contents[1]) << left.size() << " bytes, round " << round;
  }
}

}  // namespace ferrox
