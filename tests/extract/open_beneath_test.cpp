// Catches files outside of a share that are reached through a link or a path, also while folders are swapped.
#include "base/open_beneath.h"

#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <atomic>
#include <cerrno>
#include <filesystem>
#include <string>
#include <thread>

#include <gtest/gtest.h>

#include "tests/support/temp_dir.h"

namespace ferrox::test {
namespace {

using base::OpenBeneath;

class OpenBeneathTest : public testing::TestWithParam<bool> {
 protected:
  OpenBeneathTest() {
    std::filesystem::create_directories(dir_ / "share/a/b");
    std::filesystem::create_directories(dir_ / "outside");
    WriteFile(dir_ / "share/a/b/file", "inside");
    WriteFile(dir_ / "outside/file", "outside");
  }

  std::string Read(const std::string& below) {
    errno = 0;
    const base::UniqueFd file = OpenBeneath(dir_ / "share", dir_ / below, GetParam());
    char text[16] = {};
    return file.Valid() && read(file.Get(), text, sizeof(text) - 1) >= 0 ? text : "";
  }

  TempDir dir_;
};

TEST_P(OpenBeneathTest, NothingIsReachedThroughALink) {
  std::filesystem::create_symlink(dir_ / "outside", dir_ / "share/out");
  std::filesystem::create_symlink("a/b/file", dir_ / "share/relative");
  std::filesystem::create_symlink("a", dir_ / "share/inner");
  const struct {
    const char* path;
    const char* content;
    int error;
  } rows[] = {
      {"share/a/b/file", "inside", 0},   {"share/out/file", "", ELOOP},        {"share/relative", "", ELOOP},
      {"share/inner/b/file", "", ELOOP}, {"share/../outside/file", "", EXDEV}, {"share/a/b/missing", "", ENOENT},
      {"share/a/b/file/x", "", ENOTDIR}, {"outside/file", "", EINVAL},         {"share", "", EINVAL},
      {"sharep/x", "", EINVAL},
  };
  for (const auto& row : rows) {
    EXPECT_EQ(row.content, Read(row.path)) << row.path;
    if (row.error != 0) {
      EXPECT_EQ(row.error, errno) << row.path;
    }
  }
  ASSERT_EQ(0, mkfifo((dir_ / "share/fifo").c_str(), 0600));
  EXPECT_TRUE(OpenBeneath(dir_ / "share", dir_ / "share/fifo", GetParam()).Valid()) << "opened without waiting";
}

TEST_P(OpenBeneathTest, ALinkSwappedInIsNeverFollowed) {
  const std::string folder = dir_ / "share/a", aside = dir_ / "share/aside", link = dir_ / "share/link";
  std::filesystem::create_directories(dir_ / "outside/b");
  WriteFile(dir_ / "outside/b/file", "outside");
  std::filesystem::create_symlink(dir_ / "outside", link);
  std::atomic<bool> done = false;
  std::thread swapper([&] {
    while (!done) {
      (void)renameat2(AT_FDCWD, folder.c_str(), AT_FDCWD, link.c_str(), RENAME_EXCHANGE);
    }
  });
  int inside = 0, refused = 0;
  for (int i = 0; i < 20000 || ((inside == 0 || refused == 0) && i < 2000000); ++i) {
    const std::string content = Read("share/a/b/file");
    ASSERT_NE("outside", content);
    ++(content == "inside" ? inside : refused);
  }
  done = true;
  swapper.join();
  EXPECT_GT(inside, 0);
  EXPECT_GT(refused, 0);
}

INSTANTIATE_TEST_SUITE_P(ByTheKernel, OpenBeneathTest, testing::Values(true));
INSTANTIATE_TEST_SUITE_P(ByWalking, OpenBeneathTest, testing::Values(false));

}  // namespace
}  // namespace ferrox::test
