#include "services/fileindexd/task_pool.h"

#include <stdexcept>

#include <gtest/gtest.h>

namespace ferrox::indexd {
namespace {

TEST(TaskPoolTest, FirstFailureComesOutAndVoidsWhatHasNotBegun) {
  TaskPool pool(2);
  const Interruption interruption;
  TaskGroup group(pool, interruption);
  std::atomic<int> done{0};
  EXPECT_THROW(
      {
        for (int i = 0; i < 1000; ++i) {
          group.Submit([&done, i] {
            if (i == 3) throw std::runtime_error("third");
            ++done;
          });
        }
        group.Wait();
      },
      std::runtime_error);
  EXPECT_LT(done, 999);
}

TEST(TaskPoolTest, InterruptionEndsSleepsInTasks) {
  const InterruptibleClock clock;
  TaskPool pool(2);
  Interruption interruption;
  TaskGroup group(pool, interruption);
  group.Submit([] { Clock::Get().SleepFor(std::chrono::hours(1)); });
  interruption.Request();
  EXPECT_THROW(group.Wait(), Interrupted);
}

TEST(TaskPoolTest, GroupsDoNotSeeEachOthersFailures) {
  TaskPool pool(2);
  const Interruption interruption;
  TaskGroup failing(pool, interruption);
  TaskGroup working(pool, interruption);
  failing.Submit([] { throw std::runtime_error("mine"); });
  std::atomic<int> done{0};
  for (int i = 0; i < 100; ++i) working.Submit([&done] { ++done; });
  working.Wait();
  EXPECT_EQ(100, done);
  EXPECT_THROW(failing.Wait(), std::runtime_error);
}

}  // namespace
}  // namespace ferrox::indexd
