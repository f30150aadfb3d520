// Catches users who are told of a round that began before they asked, and requests that hold up others.
#include "services/kovaelasticd/commands/fresh_rounds.h"

#include <atomic>
#include <future>
#include <semaphore>

#include <gtest/gtest.h>

#include "common/error.h"

namespace ferrox::engine {
namespace {

using std::chrono::steady_clock;

TEST(FreshRoundsTest, WhoComesDuringARoundSharesTheNextAndHoldsUpNobodyElse) {
  std::atomic<int> begun{0};
  std::counting_semaphore<> may_end(0);
  FreshRounds rounds([&] {
    const int round = ++begun;
    may_end.acquire();
    return round == 3 ? FreshRounds::Outcome() : std::set<std::string>{std::to_string(round)};
  });
  const auto await = [&rounds](uint32_t uid, std::chrono::milliseconds longest = std::chrono::minutes(1)) {
    return rounds.Await(uid, steady_clock::now() + longest);
  };
  const auto code = [&](uint32_t uid) {
    try {
      (void)await(uid, std::chrono::milliseconds(0));
      return 0;
    } catch (const Error& error) {
      return static_cast<int>(error.Code());
    }
  };
  const auto begin = [&](uint32_t uid) {  // code() may hold its place for a moment
    return std::async(std::launch::async, [&await, uid] {
      for (;;) {
        try {
          return await(uid);
        } catch (const Error&) {
        }
      }
    });
  };
  const auto wait_for = [](const auto& condition) {
    while (!condition()) std::this_thread::sleep_for(std::chrono::milliseconds(1));
  };
  auto first = begin(1);
  wait_for([&] { return begun == 1; });
  auto second = begin(2);
  wait_for([&] { return code(2) == Error::kEngineUserBusy; });
  EXPECT_EQ(code(1), Error::kEngineUserBusy);
  auto third = begin(3);
  auto fourth = begin(4);
  wait_for([&] { return code(5) == Error::kEngineUserBusy; });
  may_end.release();
  EXPECT_EQ(*first.get().outcome, std::set<std::string>{"1"});
  may_end.release();
  for (auto* later : {&second, &third, &fourth}) EXPECT_EQ(*later->get().outcome, std::set<std::string>{"2"});
  EXPECT_EQ(begun, 2);
  EXPECT_FALSE(await(6, std::chrono::milliseconds(1)).in_time) << "round 3 does not end";
  wait_for([&] { return begun == 3; });
  may_end.release();
  auto last = begin(7);
  wait_for([&] { return begun == 4; });
  rounds.End();
  EXPECT_FALSE(last.get().in_time);
  may_end.release();
}

}  // namespace
}  // namespace ferrox::engine
