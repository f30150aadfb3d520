#include "common/lock_file.h"

#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <atomic>
#include <filesystem>
#include <thread>

#include <gtest/gtest.h>

#include "common/error.h"
#include "common/file_util.h"
#include "common/mutex.h"
#include "common/unique_fd.h"
#include "tests/support/fake_clock.h"
#include "tests/support/log_capture.h"
#include "tests/support/temp_dir.h"

namespace ferrox {

namespace {

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

/// A clock for several threads: sleeping only gives way.
class YieldingClock : public Clock {
 public:
  YieldingClock() { before_ = Clock::Set(this); }
  ~YieldingClock() override { (void)Clock::Set(before_); }
  void SleepFor(std::chrono::milliseconds) override { std::this_thread::yield(); }

 private:
  Clock* before_;
};

// Without the check that the locked file is still the one at the path, a writer now and then gets the lock of the file
// that has just been renamed and read, and its line is lost.
TEST(LockFileStressTest, NoLineIsLostWhileTheQueueIsDetached) {
  constexpr int kLines = 3000;
  const YieldingClock clock;
  const test::TempDir dir;
  const std::string queue = dir / "queue";
  std::atomic<int> writers{2};
  const auto write_lines = [&] {
    for (int left = kLines; left > 0;) try {
        const LockFile lock(queue, true);
        const UniqueFd out(open(queue.c_str(), O_WRONLY | O_APPEND | O_CLOEXEC));
        if (write(out.Get(), "x\n", 2) == 2) --left;
      } catch (const Error&) {  // 64 attempts without a pause may not do
      }
    --writers;
  };
  std::thread first(write_lines), second(write_lines);
  size_t read_bytes = 0;
  for (bool last = false; !last;) try {
      last = writers == 0;
      const LockFile lock(queue, true);
      ASSERT_EQ(rename(queue.c_str(), (queue + ".tmp").c_str()), 0);
      read_bytes += test::ReadFile(queue + ".tmp").size();
    } catch (const Error&) {
      last = false;
    }
  first.join();
  second.join();
  EXPECT_EQ(read_bytes, 2U * 2U * kLines);
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
