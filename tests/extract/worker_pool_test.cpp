// Catches workers that escape, good files blamed for bad ones, and anything a misbehaving worker leaves behind.
#include "services/kovacontentextractd/worker_pool.h"

#include <fcntl.h>
#include <unistd.h>

#include <atomic>
#include <fstream>
#include <string>
#include <thread>
#include <vector>

#include <gtest/gtest.h>

#include "base/unique_fd.h"
#include "common/error.h"
#include "services/kovacontentextractd/sandbox.h"
#include "tests/support/temp_dir.h"

namespace ferrox::test {
namespace {

using extract::Answer;
using extract::WorkerPool;
using kova::content::Program;
using namespace std::chrono_literals;

WorkerPool::Options TestOptions(unsigned workers = 1) {
  WorkerPool::Options options;
  options.programs = {FERROX_TEST_WORKER, "", "/no/such/program"};
  options.empty_folder = TestRoot() + "/tmp";
  options.workers_max = workers;
  return options;
}

class WorkerPoolTest : public testing::Test {
 protected:
  struct Result : Answer {
    std::string text;
  };
  Result Read(WorkerPool& pool, const std::string& reader, const std::string& content = "content") {
    WriteFile(dir_ / "file", content);
    const base::UniqueFd file(open((dir_ / "file").c_str(), O_RDONLY | O_CLOEXEC));
    Result result;
    const auto sink = [&result](size_t offset, std::string_view piece) {
      result.text.resize(offset);
      result.text.append(piece);
    };
    static_cast<Answer&>(result) = pool.Read(Program::kGeneral, {file.Get(), reader, "txt", "file.txt"}, sink);
    EXPECT_EQ(result.text_bytes, result.fields.isMember("_KOVAExtractError") ? 0 : result.text.size());
    return result;
  }

  TempDir dir_;
};

int64_t ResidentKiB() {
  std::ifstream status("/proc/self/status");
  for (std::string word; status >> word;) {
    int64_t kib = 0;
    if (word == "VmRSS:" && status >> kib) return kib;
  }
  return -1;
}

TEST_F(WorkerPoolTest, TheSandboxHolds) {
  WorkerPool pool(TestOptions());
  const Result answer = Read(pool, "escape");
  EXPECT_EQ("tried", answer.text);
  EXPECT_EQ("", answer.fields["KOVAMDComment"].asString()) << "these worked";
  EXPECT_EQ(Json::arrayValue, pool.Status()["missing"].type());
}

TEST_F(WorkerPoolTest, EachBadFileIsBlamedOnceAndTheNextIsRead) {
  WorkerPool pool(TestOptions());
  const struct {
    const char* reader;
    std::string content;
    const char* reason;
  } rows[] = {
      {"crash", "", "crashed the reader"},
      {"be killed", "", "needs too much memory"},
      {"spin", "", "took too long"},
      {"devour", "", "needs too much memory"},
      {"announce", "", "confused the reader"},
      {"babble", "", "confused the reader"},
      {"bytes", "not JSON", "confused the reader"},
      {"bytes", "[1]", "confused the reader"},
      {"bytes", "{\"KOVAMDTitle\":\"x", "confused the reader"},
      {"long text", "", "confused the reader"},
      {"bytes", std::string(100000, '['), "confused the reader"},
      {"halves", "", "crashed the reader"},
      {"another", "", "confused the reader"},
  };
  uint64_t read = 0;
  for (const auto& row : rows) {
    if (extract::kSanitized && row.reader == std::string("devour")) continue;
    EXPECT_EQ(row.reason, Read(pool, row.reader, row.content).fields["_KOVAExtractError"].asString()) << row.reader;
    const Result next = Read(pool, "count");
    EXPECT_FALSE(next.fields.isMember("_KOVAExtractError")) << "after " << row.reader;
    EXPECT_FALSE(next.text.empty()) << "after " << row.reader;
    read += 2;
  }
  EXPECT_EQ(read, pool.Status()["files"].asUInt64());
}

TEST_F(WorkerPoolTest, ASilentWorkerIsEnded) {
  WorkerPool::Options options = TestOptions();
  options.longest_read = 200ms;
  WorkerPool pool(options);
  for (const char* reader : {"hang", "drips"}) {
    EXPECT_EQ("took too long", Read(pool, reader).fields["_KOVAExtractError"].asString()) << reader;
    EXPECT_EQ(0U, pool.Status()["workers"].asUInt());
  }
}

TEST_F(WorkerPoolTest, WhatAWorkerDoesBehindItsAnswerIsNotTheNextFilesFault) {
  WorkerPool pool(TestOptions());
  for (const char* reader : {"talk", "leave", "talk", "leave"}) {
    EXPECT_FALSE(Read(pool, reader).fields.isMember("_KOVAExtractError")) << reader;
    EXPECT_EQ("1", Read(pool, "count").text) << "of a new worker, behind " << reader;
  }
  EXPECT_EQ(0U, pool.Status()["blamed"].asUInt());
}

TEST_F(WorkerPoolTest, APoolThatStopsBlamesNobody) {
  WorkerPool pool(TestOptions());
  EXPECT_EQ("1", Read(pool, "count").text);
  std::thread stopper([&pool] {
    while (pool.Status()["reading"].asUInt() == 0) std::this_thread::sleep_for(1ms);
    pool.Stop();
  });
  EXPECT_THROW((void)Read(pool, "hang"), Error);
  stopper.join();
  EXPECT_THROW((void)Read(pool, "count"), Error);
  EXPECT_EQ(0U, pool.Status()["blamed"].asUInt());
}

TEST_F(WorkerPoolTest, AnAnswerIsNeverTakenForAnotherFiles) {
  WorkerPool pool(TestOptions());
  EXPECT_EQ("of another file", Read(pool, "twice").fields["KOVAMDTitle"].asString()) << "the file's own lie";
  EXPECT_EQ("1", Read(pool, "count").text) << "not what the old worker had left to say";
}

TEST_F(WorkerPoolTest, WorkersAreReplacedInTime) {
  WorkerPool::Options options = TestOptions();
  options.files_per_worker = 3;
  WorkerPool patient(options);
  std::string counts;
  for (int i = 0; i < 7; ++i) counts += Read(patient, "count").text;
  EXPECT_EQ("1231231", counts);
  options.idle_time = 20ms;
  WorkerPool pool(options);
  EXPECT_EQ("1", Read(pool, "count").text);
  for (int i = 0; i < 6000 && pool.Status()["workers"].asUInt() != 0; ++i) std::this_thread::sleep_for(10ms);
  EXPECT_EQ(0U, pool.Status()["workers"].asUInt()) << "an idle pool is empty";
  EXPECT_THROW(pool.Probe(Program::kPhoto), Error) << "a program that cannot be run";
  EXPECT_EQ("1", Read(pool, "count").text);
}

TEST_F(WorkerPoolTest, HundredsOfBadFilesLeaveNothingBehind) {
  WorkerPool pool(TestOptions(4));
  const std::string content = "{\"KOVAMDTitle\":\"" + std::string(900000, 'x') + "\"}";
  const auto round = [&](int files) {
    std::atomic<int> left = files, blamed = 0;
    std::vector<std::thread> threads;
    for (int t = 0; t < 4; ++t) {
      threads.emplace_back([&] {
        const base::UniqueFd file(open((dir_ / "file").c_str(), O_RDONLY | O_CLOEXEC));
        constexpr const char* kReaders[] = {"crash", "bytes", "announce", "babble", "be killed"};
        for (int i; (i = --left) >= 0;) {
          const auto drop = [](size_t, std::string_view) {};
          const Answer answer = pool.Read(Program::kGeneral, {file.Get(), kReaders[i % 5], "", "x"}, drop);
          blamed += answer.fields.isMember("_KOVAExtractError") ? 1 : 0;
        }
      });
    }
    for (std::thread& thread : threads) thread.join();
    return blamed.load();
  };
  WriteFile(dir_ / "file", content);
  (void)round(100);
  const int64_t before = ResidentKiB();
  EXPECT_EQ(320, round(400));
  if (!extract::kSanitized) {  // a sanitizer keeps what has been freed
    EXPECT_LT(ResidentKiB() - before, 4 * 1024);
  }
}

}  // namespace
}  // namespace ferrox::test
