#include "common/lock_file.h"

#include <fcntl.h>
#include <sys/stat.h>
#include <sys/syscall.h>
#include <unistd.h>

#include <filesystem>
#include <functional>
#include <thread>
#include <utility>

#include <gtest/gtest.h>

#include "common/error.h"
#include "common/file_util.h"
#include "common/mutex.h"
#include "tests/support/fake_clock.h"
#include "tests/support/log_capture.h"
#include "tests/support/temp_dir.h"

namespace ferrox::test_lock {

std::function<void()> g_before_flock;

}  // namespace ferrox::test_lock

/// The system's call, with a moment before it that a test can use once.
extern "C" int HookedFlock(int fd, int operation) noexcept asm("flock");
int HookedFlock(int fd, int operation) noexcept {
  if (const auto before = std::exchange(ferrox::test_lock::g_before_flock, nullptr)) before();
  return static_cast<int>(syscall(SYS_flock, fd, operation));
}

namespace ferrox {

namespace {

using test_lock::g_before_flock;

std::string Failure(const std::string& path, bool exclusive) {
  try {
    const LockFile lock(path, exclusive);
    return {};
  } catch (const Error& error) {
    EXPECT_EQ(error.Code(), Error::kLockFailed);
    return error.what();
  }
}

class LockFileTest : public testing::Test {
 protected:
  test::TempDir dir_;
  test::FakeClock clock_;
  test::LogCapture log_;
};

}  // namespace

TEST_F(LockFileTest, ExclusiveLockIsWaitedForAtMost64Times) {
  const std::string path = dir_ / "lock";
  {
    const LockFile held(path, false);
    EXPECT_EQ(Failure(path, false), "") << "shared holders coexist";
    EXPECT_EQ(Failure(path, true), "Exceed max retry, path=" + path);
  }
  ASSERT_EQ(clock_.sleeps.size(), 64U);
  for (const auto pause : clock_.sleeps) {
    EXPECT_LE(pause.count(), 900);
    EXPECT_EQ(pause.count() % 100, 0);
  }
  EXPECT_EQ(Failure(path, true), "") << "the end of its scope frees the lock";
  EXPECT_TRUE(IsFileExist(path)) << "the file stays";
  EXPECT_EQ(Failure(path, true), "");
}

TEST_F(LockFileTest, OnlyARegularFileCanBeALock) {
  EXPECT_EQ(Failure(dir_ / "no/lock", true),
            "open failed, path=" + dir_ / "no/lock" + ", reason=No such file or directory");
  EXPECT_TRUE(log_.Contains("Failed [0 > (fd_ = open(path_.c_str(), O_RDONLY | O_CREAT, 0644))], reason: open failed"));
  std::filesystem::create_symlink(dir_ / "target", dir_ / "link");
  EXPECT_EQ(Failure(dir_ / "link", true).rfind("open failed, path=", 0), 0U);
  EXPECT_FALSE(IsFileExist(dir_ / "target")) << "the link was followed";
  ASSERT_EQ(mkfifo((dir_ / "fifo").c_str(), 0600), 0);
  EXPECT_EQ(Failure(dir_ / "fifo", true), "open failed, path=" + dir_ / "fifo" + ", reason=not a regular file");
}

// Between opening and locking, the file is renamed away, as a queue is: what gets locked is no longer the queue.
TEST_F(LockFileTest, ALockOnAFileThatWasRenamedAwayDoesNotCount) {
  const std::string queue = dir_ / "queue";
  test::WriteFile(queue, "line\n");
  g_before_flock = [&] { std::filesystem::rename(queue, queue + ".tmp"); };
  const LockFile lock(queue, true);
  struct stat locked = {}, named = {}, detached = {};
  ASSERT_EQ(fstat(lock.Descriptor(), &locked), 0);
  ASSERT_EQ(stat(queue.c_str(), &named), 0) << "made anew";
  ASSERT_EQ(stat((queue + ".tmp").c_str(), &detached), 0);
  EXPECT_EQ(locked.st_ino, named.st_ino);
  EXPECT_NE(locked.st_ino, detached.st_ino);
  EXPECT_TRUE(clock_.sleeps.empty()) << "there is nothing to wait for";
  EXPECT_EQ(Failure(queue + ".tmp", true), "") << "the detached file is not locked";
}

TEST_F(LockFileTest, DescriptorsAreNotInherited) {
  const LockFile lock(dir_ / "lock", true);
  EXPECT_NE(fcntl(lock.Descriptor(), F_GETFD) & FD_CLOEXEC, 0);
}

TEST(MutexTest, ExcludesAndReports) {
  Mutex mutex;
  {
    const LockMutex guard(mutex);
    std::thread([&mutex] { EXPECT_FALSE(mutex.TryLock()); }).join();
  }
  EXPECT_TRUE(mutex.TryLock());
  EXPECT_TRUE(mutex.Unlock());
  int sum = 0;
  const auto add = [&] {
    for (int i = 0; i < 20000; ++i) {
      const LockMutex guard(mutex);
      ++sum;
    }
  };
  std::thread other(add);
  add();
  other.join();
  EXPECT_EQ(sum, 40000);
}

}  // namespace ferrox
