// Catches failures of tasks that get lost, and urgent tasks and interruptions that have to wait.
#include "services/fileindexd/task_pool.h"

#include <future>
#include <stdexcept>

#include <gtest/gtest.h>

namespace ferrox::indexd {
namespace {

TEST(TaskPoolTest, FirstFailureComesOutAndVoidsWhatHasNotBegunOfItsGroup) {
  TaskPool pool(2);
  const Interruption interruption;
  TaskGroup failing(pool, interruption);
  TaskGroup working(pool, interruption);
  std::atomic<int> done{0};
  std::atomic<int> beside{0};
  int begun = 0;
  EXPECT_THROW(
      {
        for (; begun < 1000; ++begun) {
          working.Submit([&beside] { ++beside; });
          failing.Submit([&done, i = begun] {
            if (i == 3) throw std::runtime_error("third");
            ++done;
          });
        }
        failing.Wait();
      },
      std::runtime_error);
  EXPECT_LT(done, 999);
  working.Wait();
  EXPECT_GE(beside, begun);
}

TEST(TaskPoolTest, UrgentTaskWaitsForNoOther) {
  TaskPool pool(2);
  const Interruption interruption;
  TaskGroup slow(pool, interruption);
  TaskGroup urgent(pool, interruption);
  urgent.SetUrgent(true);
  std::mutex mutex;
  mutex.lock();
  std::atomic<int> running{0};
  for (int i = 0; i < 10; ++i) {
    slow.Submit([&] {
      ++running;
      const std::lock_guard wait(mutex);
    });
  }
  std::atomic<int> done{0};
  for (int i = 0; i < 100; ++i) urgent.Submit([&done] { ++done; });
  urgent.Wait();
  EXPECT_EQ(100, done);
  EXPECT_LE(running, 2);
  mutex.unlock();
  slow.Wait();
  EXPECT_EQ(10, running);
}

TEST(TaskPoolTest, InterruptionEndsSleepsInTasks) {
  const InterruptibleClock clock;
  TaskPool pool(2);
  Interruption interruption;
  TaskGroup group(pool, interruption);
  group.Submit([] { Clock::Get().SleepFor(std::chrono::hours(1)); });
  interruption.Request();
  EXPECT_THROW(group.Wait(), Interrupted);
  // Nor does it wait for threads that another group's tasks hold.
  std::promise<void> answer;
  const std::shared_future<void> done = answer.get_future().share();
  const Interruption none;
  TaskGroup hung(pool, none), next(pool, interruption);
  interruption.Clear();
  for (int i = 0; i < 2; ++i) hung.Submit([&done] { done.wait(); });
  next.Submit([] {});
  interruption.Request();
  EXPECT_THROW(next.Wait(), Interrupted);
  answer.set_value();
}

}  // namespace
}  // namespace ferrox::indexd
