// Catches paths cut in the wrong place, and files of which a failed replacement leaves half.
#include "common/file_util.h"

#include <sys/stat.h>
#include <unistd.h>

#include <kova/fs.h>

#include "tests/support/library_test.h"

namespace ferrox {

namespace {

namespace fs = std::filesystem;
using test::WriteFile;

class FileUtilTest : public test::LibraryTest {
 protected:
  test::TempDir dir_;
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
           Row{"/v.d/", "", "/v.d", "", ""},
           Row{"/v/.Hidden", ".Hidden", "/v", "Hidden", "hidden"},
           Row{"/v/a.tar.gz", "a.tar.gz", "/v", "gz", "gz"},
           Row{"/v/x.\xc4Z", "x.\xc4Z", "/v", "\xc4Z", "\xc4z"},
       }) {
    EXPECT_EQ(Basename(row.path), row.base) << row.path;
    EXPECT_EQ(Dirname(row.path), row.dirname) << row.path;
    EXPECT_EQ(GetFileExtension(row.path, false), row.extension) << row.path;
    EXPECT_EQ(GetFileExtension(row.path, true), row.lower) << row.path;
  }
  EXPECT_TRUE(StringStartWith("abc", "") && StringStartWith("abc", "abc"));
  EXPECT_FALSE(StringStartWith("ab", "abc") || StringStartWith("xabc", "abc"));
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
    EXPECT_EQ(IsFileExist(dir_ / row.name), row.file) << row.name;
    EXPECT_EQ(IsDirExist(dir_ / row.name, false), row.folder) << row.name;
    EXPECT_EQ(IsDirExist(dir_ / row.name, true), row.folder_followed) << row.name;
  }
  dirent entry = {};
  for (const auto& [type, expected] : {std::pair{DT_DIR, true}, {DT_REG, false}, {DT_UNKNOWN, false}}) {
    entry.d_type = static_cast<unsigned char>(type);
    EXPECT_EQ(IsDirentDir(entry, dir_ / "folder"), expected) << type;
  }
  EXPECT_EQ(RealPath(dir_ / "to_link/../folder/."), fs::canonical(dir_ / "folder").string());
  EXPECT_EQ(RealPath(dir_ / "missing"), "");
  EXPECT_TRUE(Unlink(dir_ / "file") && Unlink(dir_ / "file")) << "what is missing is gone";
  EXPECT_FALSE(Unlink(dir_ / "folder"));
}

TEST_F(FileUtilTest, PlatformAnswersArePassedOn) {
  platform_.permissions = {{"/p", KOVA_PERM_READ | KOVA_PERM_EXECUTE}};
  EXPECT_TRUE(CheckACLPerm("/p", KOVA_PERM_READ | KOVA_PERM_WRITE));
  EXPECT_FALSE(CheckACLPerm("/p", KOVA_PERM_WRITE) || CheckACLPerm("/no/such", KOVA_PERM_READ));
  WriteFile(dir_ / "a", "x");
  EXPECT_TRUE(CPFile(dir_ / "a", dir_ / "b") && MVFile(dir_ / "a", dir_ / "c"));
  EXPECT_FALSE(MVFile(dir_ / "a", dir_ / "d"));
  EXPECT_EQ(test::FailureOf([&] { (void)ChownFerrox(dir_ / "c"); }), "801 ");
  platform_.users["Ferrox"] = {getuid(), getgid(), false, "/", 0};
  EXPECT_TRUE(ChownFerrox(dir_ / "c"));
  EXPECT_FALSE(ChownFerrox(dir_ / "missing"));
}

TEST_F(FileUtilTest, WholeFileIsTheOldOneOrTheNewOne) {
  const std::string path = dir_ / "f";
  const auto mode = [&path] { return fs::status(path).permissions(); };
  std::string content;
  ASSERT_TRUE(WriteWholeFile(path, "old"));
  EXPECT_EQ(mode(), fs::perms(0644));
  fs::permissions(path, fs::perms(0600));
  ASSERT_TRUE(WriteWholeFile(path, std::string("n\0w", 3)));
  EXPECT_EQ(mode(), fs::perms(0600)) << "the mode stays";

  WriteFile(dir_ / "d/in", "x");  // a folder cannot be renamed over
  EXPECT_FALSE(WriteWholeFile(dir_ / "d", "new"));
  EXPECT_FALSE(fs::exists(dir_ / "d.new")) << "nothing is left beside";
  fs::create_directory(dir_ / "f.new");  // the file beside cannot be made
  EXPECT_FALSE(WriteWholeFile(path, "newer"));
  EXPECT_TRUE(ReadWholeFile(path, content));
  EXPECT_EQ(content, std::string("n\0w", 3));
  EXPECT_FALSE(ReadWholeFile(dir_ / "d", content));
  ASSERT_EQ(mkfifo((dir_ / "fifo").c_str(), 0600), 0);
  EXPECT_FALSE(ReadWholeFile(dir_ / "fifo", content)) << "and does not wait for a writer";
}

}  // namespace ferrox
