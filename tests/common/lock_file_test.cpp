// Catches locks that two hold at once, that outlive their file, or that are waited for without end.
#include "common/lock_file.h"

#include <fcntl.h>
#include <sys/stat.h>
#include <sys/syscall.h>
#include <unistd.h>

#include <cerrno>
#include <utility>

#include "common/mutex.h"
#include "tests/support/library_test.h"

static std::function<void()> g_before_flock;

/// The system's call, with a moment before it that a test can use once.
extern "C" int HookedFlock(int fd, int operation) noexcept asm("flock");
int HookedFlock(int fd, int operation) noexcept {
  if (const auto before = std::exchange(g_before_flock, nullptr)) before();
  return static_cast<int>(syscall(SYS_flock, fd, operation));
}

namespace ferrox {

namespace {

class LockFileTest : public test::LibraryTest {
 protected:
  std::string Failure(const char* name, bool exclusive = true) {
    return test::FailureOf([&] { const LockFile lock(dir_ / name, exclusive); });
  }
  test::TempDir dir_;
};

ino_t InodeOf(const std::string& path) {
  struct stat status = {};
  EXPECT_EQ(stat(path.c_str(), &status), 0) << path;
  return status.st_ino;
}

}  // namespace

TEST_F(LockFileTest, IsWaitedForAtMost64Times) {
  {
    const LockFile held(dir_ / "lock", false);
    EXPECT_NE(fcntl(held.Descriptor(), F_GETFD) & FD_CLOEXEC, 0);
    EXPECT_EQ(Failure("lock", false), "") << "shared holders coexist";
    EXPECT_EQ(Failure("lock"), "506 Exceed max retry, path=" + dir_ / "lock");
    EXPECT_TRUE(test::LogCapture::Contains("lock: process " + std::to_string(getpid()) + " (common_tests) of user "));
  }
  ASSERT_EQ(clock_.sleeps.size(), 64U);
  for (const auto pause : clock_.sleeps) EXPECT_TRUE(pause.count() <= 900 && pause.count() % 100 == 0) << pause.count();
  EXPECT_EQ(Failure("lock"), "") << "the end of its scope frees the lock";
  EXPECT_TRUE(std::filesystem::exists(dir_ / "lock")) << "the file stays";
}

TEST_F(LockFileTest, OnlyARegularFileCanBeALock) {
  EXPECT_EQ(Failure("no/lock"), "506 open failed, path=" + dir_ / "no/lock" + ", reason=No such file or directory");
  std::filesystem::create_symlink(dir_ / "target", dir_ / "link");
  EXPECT_EQ(Failure("link").rfind("506 open failed, path=", 0), 0U);
  EXPECT_FALSE(std::filesystem::exists(dir_ / "target")) << "the link was followed";
  ASSERT_EQ(mkfifo((dir_ / "fifo").c_str(), 0600), 0);
  EXPECT_EQ(Failure("fifo"), "506 open failed, path=" + dir_ / "fifo" + ", reason=not a regular file");
}

// Between opening and locking, the file is renamed away, as a queue is: what gets locked is no longer the queue.
TEST_F(LockFileTest, ALockOnAFileThatWasRenamedAwayDoesNotCount) {
  const std::string queue = dir_ / "queue";
  test::WriteFile(queue, "line\n");
  g_before_flock = [&] { std::filesystem::rename(queue, queue + ".tmp"); };
  const LockFile lock(queue, true);
  EXPECT_EQ(InodeOf("/proc/self/fd/" + std::to_string(lock.Descriptor())), InodeOf(queue));
  EXPECT_TRUE(clock_.sleeps.empty()) << "there is nothing to wait for";
  EXPECT_EQ(Failure("queue.tmp"), "") << "the detached file is not locked";
}

TEST_F(LockFileTest, CanBeTriedOnce) {
  const std::string queue = dir_ / "queue";
  test::WriteFile(queue, "line\n");
  {
    g_before_flock = [&] { std::filesystem::rename(queue, queue + ".tmp"); };
    const auto lock = LockFile::Try(queue, true);
    ASSERT_NE(lock, nullptr);
    EXPECT_EQ(InodeOf("/proc/self/fd/" + std::to_string(lock->Descriptor())), InodeOf(queue));
    EXPECT_EQ(LockFile::Try(queue, false), nullptr);
    EXPECT_EQ(errno, EWOULDBLOCK);
  }
  EXPECT_NE(LockFile::Try(queue, true), nullptr);
  EXPECT_EQ(LockFile::Try(dir_.Path(), true), nullptr);
  EXPECT_EQ(errno, EINVAL);
  EXPECT_TRUE(clock_.sleeps.empty());
}

TEST(MutexTest, Excludes) {
  Mutex mutex;
  {
    const LockMutex guard(mutex);
    EXPECT_FALSE(mutex.TryLock());
  }
  EXPECT_TRUE(mutex.TryLock() && mutex.Unlock());
}

}  // namespace ferrox
