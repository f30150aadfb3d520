
#include "fileindex/queue_mgr.h"

#include <unistd.h>

#include <atomic>
#include <filesystem>
#include <fstream>
#include <sstream>
#include <thread>

#include <gtest/gtest.h>

#include "common/clock.h"
#include "common/error.h"
#include "common/lock_file.h"
#include "tests/support/log_capture.h"
#include "tests/support/queue_lines.h"
#include "tests/support/temp_dir.h"

namespace ferrox::test {

namespace {

using fileindex::OP;
using fileindex::QueueMgr;

class QueueMgrTest : public testing::Test {
 protected:
  /// The operations that a fresh manager, as of a process that has just started, hands out.
  std::string Process(bool use_tmp) { return Process(mgr_, use_tmp); }
  static std::string Process(QueueMgr& mgr, bool use_tmp) {
    std::ostringstream text;
    const int count = mgr.ProcessOP([&text](std::shared_ptr<OP> op) { text << op << "; "; }, use_tmp);
    text << count;
    return text.str();
  }

  TempDir dir_;
  std::string live_ = dir_ / "queue";
  std::string tmp_ = dir_ / "queue.tmp";
  QueueMgr mgr_{live_};
};

TEST_F(QueueMgrTest, NoQueueIsAnEmptyOne) {
  EXPECT_EQ(Process(true), "0");
  EXPECT_EQ(Process(false), "0");
  EXPECT_FALSE(mgr_.IsFullPathProcessing("/v"));
  EXPECT_FALSE(mgr_.IsFullPathHasReindex("/v"));
  EXPECT_FALSE(mgr_.PrepareTmpQueue());
  mgr_.DeleteTmp();
}

TEST_F(QueueMgrTest, OneManagerTakesOneQueueAfterTheOther) {
  WriteQueue(live_, {Create("/v/a")});
  EXPECT_EQ(Process(false), "[02] /v/a; 1");
  EXPECT_EQ(Process(true), "[02] /v/a; 1");
  EXPECT_FALSE(std::filesystem::exists(live_));
  WriteQueue(live_, {Create("/v/b")});
  EXPECT_EQ(Process(true), "[02] /v/a; 1");
  EXPECT_TRUE(std::filesystem::exists(live_));
  mgr_.DeleteTmp();
  EXPECT_EQ(Process(true), "[02] /v/b; 1");
  mgr_.DeleteTmp();
  EXPECT_EQ(Process(true), "0");
}

TEST_F(QueueMgrTest, EveryStopLosesNothing) {
  // After each step of a run a new process goes on; together they carry out all lines, none out of order.
  for (int stop = 0; stop < 4; ++stop) {
    SCOPED_TRACE(stop);
    WriteQueue(live_, {Create("/v/a")});
    {
      QueueMgr first(live_);
      if (stop > 0) first.PrepareTmpQueue();
      if (stop > 1) {
        EXPECT_EQ(Process(first, true), "[02] /v/a; 1");
      }
      if (stop > 2) first.DeleteTmp();
    }
    std::ofstream(live_, std::ios::app) << Create("/v/b") << "\n";
    QueueMgr second(live_);
    std::string done;
    for (std::string text; (text = Process(second, true)) != "0"; second.DeleteTmp()) done += text + "|";
    const char* const expected[] = {"[02] /v/a; [02] /v/b; 2|", "[02] /v/a; 1|[02] /v/b; 1|",
                                    "[02] /v/a; 1|[02] /v/b; 1|", "[02] /v/b; 1|"};
    EXPECT_EQ(done, expected[stop]);
  }
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
  try {
    (void)mgr_.IsFullPathProcessing("/v/b");
    ADD_FAILURE();
  } catch (const Error& error) {
    EXPECT_EQ(error.Code(), Error::kMalformedEvent);
  }
}

TEST_F(QueueMgrTest, FailedRenameLeavesTheQueue) {
  const LogCapture log;
  WriteQueue(live_, {Create("/v/a")});
  std::filesystem::create_directory(tmp_);
  try {
    mgr_.PrepareTmpQueue();
    ADD_FAILURE();
  } catch (const Error& error) {
    EXPECT_EQ(error.Code(), Error::kInternal);
    EXPECT_STREQ(error.what(), "rename failed, reason=Is a directory");
  }
  EXPECT_TRUE(LogCapture::Contains("Failed [0 > rename(queue_path_.c_str(), queue_path_tmp_.c_str())]"));
  EXPECT_EQ(Process(false), "[02] /v/a; 1");
  const LockFile free(live_, true);
}

/// Sleeps that only let others run.
class YieldClock : public Clock {
 public:
  YieldClock() : before_(Clock::Set(this)) {}
  ~YieldClock() override { (void)Clock::Set(before_); }
  void SleepFor(std::chrono::milliseconds) override { usleep(50); }

 private:
  Clock* before_;
};

TEST_F(QueueMgrTest, WritersLoseNoLineToTheDetaching) {
  constexpr int kWriters = 3;
  constexpr int kLines = 1000;
  const YieldClock clock;
  std::atomic<int> writing{kWriters};
  std::vector<std::thread> writers;
  for (int writer = 0; writer < kWriters; ++writer) {
    writers.emplace_back([this, writer, &writing] {
      for (int i = 0; i < kLines;) {
        try {
          const LockFile lock(live_, true);
          std::ofstream(live_, std::ios::app) << Create("/v/" + std::to_string(writer * kLines + i)) << "\n";
          ++i;
        } catch (const Error&) {
        }
      }
      --writing;
    });
  }
  int received = 0;
  for (bool more = true; more;) {
    more = writing != 0;
    try {
      received += mgr_.ProcessOP([](std::shared_ptr<OP>) {}, true);
      mgr_.DeleteTmp();
    } catch (const Error&) {
      more = true;
    }
  }
  for (std::thread& writer : writers) writer.join();
  EXPECT_EQ(received, kWriters * kLines);
}

}  // namespace

}  // namespace ferrox::test
