// Catches queues that are detached twice, given up half done, or lose what is written meanwhile.

#include "fileindex/queue/queue_mgr.h"

#include <unistd.h>

#include <atomic>
#include <fstream>
#include <sstream>
#include <thread>

#include <gtest/gtest.h>

#include "common/lock_file.h"
#include "tests/support/library_test.h"
#include "tests/support/queue_lines.h"

namespace ferrox::test {

namespace {

using fileindex::OP;
using fileindex::QueueMgr;

class QueueMgrTest : public testing::Test {
 protected:
  /// The operations handed out, and how many.
  std::string Process(bool use_tmp) {
    std::ostringstream text;
    const int count = mgr_.ProcessOP([&text](std::shared_ptr<OP> op) { text << op << "; "; }, use_tmp);
    text << count;
    return text.str();
  }

  TempDir dir_;
  std::string live_ = dir_ / "queue";
  std::string tmp_ = dir_ / "queue.tmp";
  QueueMgr mgr_{live_};
};

TEST_F(QueueMgrTest, OneManagerTakesOneQueueAfterTheOther) {
  EXPECT_EQ(Process(true) + Process(false), "00");
  EXPECT_FALSE(mgr_.IsFullPathProcessing("/v") || mgr_.IsFullPathHasReindex("/v"));
  WriteQueue(live_, {Create("/v/a")});
  EXPECT_EQ(Process(false), "[02] /v/a; 1");
  EXPECT_EQ(Process(true), "[02] /v/a; 1");
  EXPECT_FALSE(std::filesystem::exists(live_));
  WriteQueue(live_, {Create("/v/b")});
  EXPECT_EQ(Process(true), "[02] /v/a; 1");
  EXPECT_TRUE(std::filesystem::exists(live_));
  mgr_.DeleteTmp();
  EXPECT_EQ(Process(true), "[02] /v/b; 1");
}

TEST_F(QueueMgrTest, WhatIsProcessed) {
  WriteQueue(live_, {Modify("/v/s/a/f"), Line(fileindex::EVENT_REINDEX | fileindex::EVENT_ATTR, "/v/x")});
  WriteQueue(tmp_, {Rename("/v/old/f", "/v/new"), Reindex("/v/r")});
  const struct {
    const char* path;
    bool is_processing;
    bool has_reindex;
  } kCases[] = {
      {"/v/s/a/f", true, false}, {"/v/s/a", true, false}, {"/v/s/a/f/g", false, false}, {"/v/s/a/", false, false},
      {"/v/s/ab", false, false}, {"/v/old", true, false}, {"/v/ol", false, false},      {"/v/r", true, true},
      {"/v/r/a/b", false, true}, {"/v/rr", false, false}, {"/v", true, false},          {"/v/x", true, false},
  };
  for (const auto& test : kCases) {
    EXPECT_EQ(mgr_.IsFullPathProcessing(test.path), test.is_processing) << test.path;
    EXPECT_EQ(mgr_.IsFullPathHasReindex(test.path), test.has_reindex) << test.path;
  }
}

TEST_F(QueueMgrTest, ScanEndsAtABadLineUnlessItKnowsBefore) {
  const LogCapture log;
  WriteQueue(live_, {Modify("/v/a"), "{half"});
  EXPECT_TRUE(mgr_.IsFullPathProcessing("/v/a"));
  EXPECT_EQ(FailureOf([&] { (void)mgr_.IsFullPathProcessing("/v/b"); }), "906 Malformed event_raw: {half");
}

TEST_F(QueueMgrTest, FailedRenameLeavesTheQueue) {
  const LogCapture log;
  WriteQueue(live_, {Create("/v/a")});
  std::filesystem::create_directory(tmp_);
  EXPECT_EQ(FailureOf([&] { mgr_.PrepareTmpQueue(); }), "502 rename failed, reason=Is a directory");
  EXPECT_TRUE(LogCapture::Contains("Failed [0 > rename(queue_path_.c_str(), queue_path_tmp_.c_str())]"));
  EXPECT_EQ(Process(false), "[02] /v/a; 1");
  const LockFile free(live_, true);
}

TEST_F(QueueMgrTest, WritersLoseNoLineToTheDetaching) {
  constexpr int kWriters = 3;
  constexpr int kLines = 1000;
  // Sleeps only let others run.
  struct : Clock {
    void SleepFor(std::chrono::milliseconds) override { (void)usleep(50); }
  } clock;
  Clock* const before = Clock::Set(&clock);
  std::atomic<int> writing{kWriters};
  std::vector<std::thread> writers;
  for (int writer = 0; writer < kWriters; ++writer) {
    writers.emplace_back([this, writer, &writing] {
      for (int i = 0; i < kLines;) {
        const std::string failure = FailureOf([&] {
          const LockFile lock(live_, true);
          std::ofstream(live_, std::ios::app) << Create("/v/" + std::to_string(writer * kLines + i)) << "\n";
        });
        i += failure.empty();
      }
      --writing;
    });
  }
  int received = 0;
  for (bool more = true; more;) {
    more = writing != 0;
    const std::string failure = FailureOf([&] { received += mgr_.ProcessOP([](std::shared_ptr<OP>) {}, true); });
    if (failure.empty()) mgr_.DeleteTmp();
    more |= !failure.empty();
  }
  for (std::thread& writer : writers) writer.join();
  (void)Clock::Set(before);
  EXPECT_EQ(received, kWriters * kLines);
}

}  // namespace

}  // namespace ferrox::test
