// Catches failures that are retried too soon, too late, or told in the wrong words.
#include "services/fileindexd/retry_policy.h"

#include <sstream>

#include <gtest/gtest.h>

#include "common/error.h"

namespace ferrox::indexd {
namespace {

/// One retry in a line: its state (3 paused, 4 to 7 waiting for space, engine, volume, content, 8 error), "first" or
/// "again", "!" when syncs fail, the delay and the sentence.
std::string Told(const Retry& retry) {
  std::ostringstream told;
  told << static_cast<int>(retry.state) << (retry.is_first ? " first " : " again ") << (retry.fails_syncs ? "!" : "")
       << retry.delay.count() << (retry.sentence != nullptr ? std::string(" ") + retry.sentence : "") << "; ";
  return told.str();
}

TEST(RetryPolicyTest, EachProblemHasItsStateSentenceAndDelays) {
  const struct {
    const char* what;
    std::vector<RetryPolicy::Failure> failures;
    const char* retries;
  } rows[] = {
      {"disk full, as library and engine say it",
       {{Error::kSpaceNotEnough, true}, {Error::kEngineStorage, true}, {Error::kEngineStorage, true}},
       "4 first !10000 less than 100 MiB are free; indexing goes on by itself when there is more; "
       "4 first !10000 less than 100 MiB are free; indexing goes on by itself when there is more; "
       "4 again !20000 less than 100 MiB are free; indexing goes on by itself when there is more; "},
      {"volume away, and then something else with its folder",
       {{Error::kPathNotIndexable, false, true}, {Error::kPathNotIndexable, false, true}, {Error::kPathNotIndexable}},
       "6 first !70; 6 again !70; 8 again !2000; "},
      {"another failure while it is away", {{Error::kInternal, false, true}}, "8 first !2000; "},
      {"engine down",
       {{Error::kEngineUnreachable}, {Error::kEngineUnreachable}},
       "5 first !1000 the search engine does not answer; start it with 'fileindexctl up'; "
       "5 again !2000 the search engine does not answer; start it with 'fileindexctl up'; "},
      {"extraction down", {{Error::kParseFailed}, {Error::kParseFailed}}, "7 first !1000; 7 again !2000; "},
      {"index paused",
       {{Error::kEngineIndexPaused}},
       "3 first !500 the share's index is paused; 'fileindexctl share resume' resumes it; "},
      {"an index that is upgraded is asked for each second, in the engine's words",
       {{Error::kEngineIndexUpgrading}, {Error::kEngineIndexUpgrading}, {Error::kEngineIndexUpgrading}},
       "5 first !1000; 5 again !1000; 5 again !1000; "},
      {"index missing: no sync fails",
       {{Error::kEngineNoSuchIndex}, {Error::kEngineNoSuchIndex}, {Error::kEngineNoSuchIndex}},
       "5 first 500; 5 again 1000; 5 again 2000; "},
      {"an engine that was killed says so once",
       {{Error::kEngineStorage}, {Error::kEngineStorage}},
       "5 first 100; 8 again !2000; "},
      {"any other",
       {{Error::kInternal}, {Error::kInternal}, {Error::kLoadFailed}},
       "8 first !2000; 8 again !4000; 8 first !2000; "},
  };
  for (const auto& row : rows) {
    RetryPolicy policy(std::chrono::milliseconds(70));
    std::string retries;
    for (const auto& failure : row.failures) retries += Told(policy.OnError(failure, {}));
    EXPECT_EQ(row.retries, retries) << row.what;
  }
}

TEST(RetryPolicyTest, DelaysGrowToALongestAndBeginAnewAfterSuccess) {
  RetryPolicy policy{{}};
  Retry last;
  for (int i = 0; i < 20; ++i) last = policy.OnError({Error::kEngineUnreachable}, {});
  EXPECT_EQ("5 again !30000 the search engine does not answer; start it with 'fileindexctl up'; ", Told(last));
  EXPECT_EQ("8 again !60000; ", Told(policy.OnUnexpected()));
  EXPECT_EQ("8 again !120000; ", Told(policy.OnUnexpected()));
  policy.OnSuccess();
  EXPECT_FALSE(policy.IsFailing());
  EXPECT_EQ("8 first !10000; ", Told(policy.OnUnexpected()));
  for (int i = 0; i < 20; ++i) last = policy.OnError({Error::kInternal}, {});
  EXPECT_EQ("8 again !300000; ", Told(last));
}

TEST(RetryPolicyTest, HowLongAFailureLastsIsCountedFromItsFirst) {
  using std::chrono::seconds;
  const RetryPolicy::TimePoint begin;
  RetryPolicy policy{{}};
  const auto lasts = [&](int seconds_later) {
    return policy.HasFailedFor(Error::kEngineNoSuchIndex, seconds(5), begin + seconds(seconds_later));
  };
  policy.OnError({Error::kEngineNoSuchIndex}, begin);
  policy.OnError({Error::kEngineNoSuchIndex}, begin + seconds(3));
  EXPECT_FALSE(lasts(4));
  EXPECT_TRUE(lasts(5));
  policy.OnError({Error::kEngineUnreachable}, begin + seconds(5));
  EXPECT_FALSE(lasts(50));
  policy.OnError({Error::kEngineNoSuchIndex}, begin + seconds(6));
  EXPECT_FALSE(lasts(10));
}

}  // namespace
}  // namespace ferrox::indexd
