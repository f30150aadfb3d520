// Catches changes that become the wrong lines, of the wrong queue, too late, or none while a queue is blocked.
#include "services/kovanotifyd/queues/queue_router.h"

#include <sys/resource.h>

#include <csignal>
#include <ctime>
#include <filesystem>
#include <sstream>

#include <gtest/gtest.h>

#include "common/lock_file.h"
#include "fileindex/optree/optree.h"
#include "tests/support/log_capture.h"
#include "tests/support/temp_dir.h"

namespace ferrox::notifyd {

namespace {

using Kind = Change::Kind;
using Queues = std::map<std::string, std::vector<QueueWatch>>;
using std::chrono::milliseconds;

constexpr uint32_t kAll = 0xFFC6;
constexpr bool kFolder = true;

Change Created(const std::string& path, bool is_folder = false) { return {Kind::kCreated, is_folder, path}; }
Change Modified(const std::string& path) { return {Kind::kModified, false, path}; }
Change Written(const std::string& path) { return {Kind::kWritten, false, path}; }
Change Attributes(const std::string& path) { return {Kind::kAttributes, false, path}; }
Change Deleted(const std::string& path, bool is_folder = false) { return {Kind::kDeleted, is_folder, path}; }
Change ByNumber(uint64_t file) { return {Kind::kByNumber, false, "/v", {}, file}; }
Change Renamed(const std::string& from, const std::string& to, bool is_folder = false) {
  return {Kind::kRenamed, is_folder, to, from};
}

/// The lines as "bits path" or "bits old -> path", folders with a "/" behind the path, each followed by a blank.
std::string Lines(const std::string& queue) {
  std::istringstream stream(test::ReadFile(queue));
  std::ostringstream text;
  for (std::string line; std::getline(stream, line);) {
    const fileindex::Event event(line);
    text << std::hex << event.event << " " << (event.path_old.empty() ? "" : event.path_old + " -> ") << event.path
         << (event.is_dir ? "/ " : " ");
  }
  return text.str();
}

class QueueRouterTest : public testing::Test {
 protected:
  void Put(const std::vector<Change>& changes) {
    for (const Change& change : changes) router_.Put(change, now_);
  }
  /// What the changes make of a fresh queue that watches "/v".
  std::string LinesOf(const std::vector<Change>& changes, uint32_t mask = kAll) {
    (void)remove(queue_.c_str());
    router_.SetQueues({{queue_, {{"/v", mask, {"@eaDir"}}}}});
    Put(changes);
    (void)router_.FlushAll(now_);
    return Lines(queue_);
  }

  test::TempDir dir_;
  const std::string queue_ = dir_ / "queue";
  const std::string other_ = dir_ / "other";
  QueueRouter::Options options_;
  QueueRouter router_{options_};
  QueueRouter::TimePoint now_{milliseconds(1000000)};
};

}  // namespace

TEST_F(QueueRouterTest, ChangesOfOnePathThatWaitTogetherAreOneLine) {
  const struct {
    std::vector<Change> changes;
    std::string lines;
  } kRows[] = {
      {{Created("/v/f"), Modified("/v/f"), Attributes("/v/f"), Written("/v/f")}, "40 /v/f "},
      {{Attributes("/v/f"), Written("/v/f"), Written("/v/f"), Attributes("/v/f")}, "2 /v/f "},
      {{Created("/v/f"), Written("/v/f"), Deleted("/v/f")}, "80 /v/f "},
      {{Deleted("/v/f"), Written("/v/g"), Created("/v/f"), Written("/v/f")}, "40 /v/f 2 /v/g "},
      {{Deleted("/v/f"), Attributes("/v/f")}, "40 /v/f "},
      {{Modified("/v/f"), Modified("/v/f")}, "2 /v/f "},
      {{Modified("/v/f"), Deleted("/v/f")}, "80 /v/f "},
      // A folder stands for all below it, but no rename.
      {{Created("/v/d", kFolder), Created("/v/d/f"), Created("/v/d/e", kFolder), Written("/v/df")},
       "40 /v/d/ 2 /v/df "},
      {{Deleted("/v/d/e/f"), Deleted("/v/d/e", kFolder), Deleted("/v/d", kFolder)}, "80 /v/d/ "},
      {{Written("/v/d/f"), Renamed("/v/d/f", "/v/d/g"), Created("/v/d/f"), Deleted("/v/d", kFolder)},
       "2 /v/d/f 100 /v/d/f -> /v/d/g 80 /v/d/ "},
      // The old name is another file behind the rename.
      {{Created("/v/f"), Renamed("/v/f", "/v/g"), Created("/v/f"), Written("/v/g")},
       "40 /v/f 100 /v/f -> /v/g 40 /v/f 2 /v/g "},
      {{Created("/v/d/f"), Renamed("/v/d", "/v/e", kFolder), Created("/v/d/f")},
       "40 /v/d/f 100 /v/d -> /v/e/ 40 /v/d/f "},
      // A name that was a file and is a folder, or the other way round.
      {{Deleted("/v/x"), Created("/v/x", kFolder), Created("/v/x/f")}, "10000 /v/x/ "},
      {{Deleted("/v/x", kFolder), Created("/v/x"), Written("/v/x")}, "10000 /v/x/ "},
      {{Written("/v/a/f"), {Kind::kUncertain, true, "/v/a"}, Written("/v/a/g")}, "10000 /v/a/ "},
      {{{Kind::kUncertain, false, "/"}}, "10000 /v/ "},
  };
  for (const auto& row : kRows) {
    SCOPED_TRACE(row.lines);
    EXPECT_EQ(LinesOf(row.changes), row.lines);
  }
}

TEST_F(QueueRouterTest, TheMaskSaysWhichChangesAreReported) {
  const std::vector<Change> changes = {Created("/v/a"), Written("/v/b"),         Attributes("/v/c"),
                                       Deleted("/v/d"), Renamed("/v/e", "/v/f"), {Kind::kUncertain, true, "/v/g"}};
  const struct {
    uint32_t mask;
    std::string lines;
  } kRows[] = {
      {0xFFC6, "40 /v/a 2 /v/b 4 /v/c 80 /v/d 100 /v/e -> /v/f 10000 /v/g/ "},
      {0xFFC6 & ~0x100U, "40 /v/a 2 /v/b 4 /v/c 80 /v/d 80 /v/e 40 /v/f 10000 /v/g/ "},
      {0x82, "2 /v/b 80 /v/d 80 /v/e 10000 /v/g/ "},
      {0x40, "40 /v/a 40 /v/f 10000 /v/g/ "},
      {0x100, "100 /v/e -> /v/f 10000 /v/g/ "},
      {0xFE38, "10000 /v/g/ "},
  };
  for (const auto& row : kRows) EXPECT_EQ(LinesOf(changes, row.mask), row.lines);
  EXPECT_EQ(LinesOf({Modified("/v/a")}, 0x40), "");
  Put({Modified("/v/a")});
  EXPECT_EQ(router_.Flush(now_), QueueRouter::TimePoint::max()) << "nobody wants to know";
  EXPECT_EQ(LinesOf({Deleted("/v/a"), Created("/v/a"), Written("/v/a")}, 0x82), "2 /v/a ") << "no create was asked for";
}

TEST_F(QueueRouterTest, EachQueueHearsOfItsFolders) {
  const struct {
    Change change;
    std::string lines, other;
  } kRows[] = {
      {Written("/v/a/f"), "2 /v/a/f ", ""},
      {Written("/v/ab/f"), "", ""},
      {Written("/v/a/x/@eaDir/f"), "", ""},
      {Written("/v/a/x@eaDir"), "2 /v/a/x@eaDir ", ""},
      {Written("/v/a/in/f"), "2 /v/a/in/f ", "2 /v/a/in/f "},
      {Attributes("/v/a/in/f"), "4 /v/a/in/f ", ""},
      {Written("/v/a/skip/f"), "", ""},
      {Written("/v/a/skip/not/f"), "2 /v/a/skip/not/f ", ""},
      {Attributes("/v/a/plain/f"), "", ""},
      {Renamed("/v/a/f", "/v/b/f"), "100 /v/a/f -> /v/b/f ", ""},
      {Renamed("/v/a/f", "/v/a/@eaDir/f"), "80 /v/a/f ", ""},
      {Renamed("/v/x/d", "/v/a/d", kFolder), "40 /v/a/d/ ", ""},
      {Renamed("/v/a/in/f", "/v/o/f"), "80 /v/a/in/f ", "100 /v/a/in/f -> /v/o/f "},
      {Renamed("/v/o/f", "/v/b/f"), "40 /v/b/f ", "80 /v/o/f "},
      {Deleted("/v/b", kFolder), "80 /v/b/ ", ""},
      {Renamed("/v/b", "/v/c", kFolder), "80 /v/b/ ", ""},
      {Renamed("/v/c", "/v/o", kFolder), "", "40 /v/o/ "},
      {{Kind::kUncertain, true, "/v"}, "10000 /v/a/ 10000 /v/b/ ", "10000 /v/a/in/ 10000 /v/o/ "},
      {{Kind::kUncertain, true, "/v/a/skip"}, "10000 /v/a/skip/not/ ", ""},
      {{Kind::kUncertain, true, "/v/o/d"}, "", "10000 /v/o/d/ "},
      {{Kind::kAttributes, true, "/v"}, "4 /v/a/ 4 /v/a/skip/not/ 4 /v/b/ ", "4 /v/o/ "},
  };
  router_.SetQueues(
      {{queue_, {{"/v/a", kAll, {"@eaDir", "skip"}}, {"/v/a/skip/not", kAll}, {"/v/a/plain", 0x2}, {"/v/b/", kAll}}},
       {other_, {{"/v/a/in", kAll & ~4U}, {"/v/o", kAll}}}});
  for (const auto& row : kRows) {
    SCOPED_TRACE(row.change.old_path + " " + row.change.path);
    for (const std::string& queue : {queue_, other_}) test::WriteFile(queue, "");
    Put({row.change});
    EXPECT_EQ(router_.FlushAll(now_), "");
    EXPECT_EQ(Lines(queue_), row.lines);
    EXPECT_EQ(Lines(other_), row.other);
  }
}

TEST_F(QueueRouterTest, AFileThatStaysOpenIsReportedWhenItIsQuietOrAfterSomeTime) {
  router_.SetQueues({{queue_, {{"/v", kAll}}}});
  const auto start = now_;
  const auto at = [&](int ms) { return now_ = start + milliseconds(ms); };
  Put({Created("/v/new"), Modified("/v/new"), Modified("/v/quiet")});
  for (int ms = 0; ms <= 6000; ms += 100) {
    at(ms);
    Put({Modified("/v/log")});
    (void)router_.Flush(now_);
    if (ms == 400) {
      EXPECT_EQ(Lines(queue_), "40 /v/new ");
    }
    if (ms == 500 || ms == 4900) {
      EXPECT_EQ(Lines(queue_), "40 /v/new 2 /v/quiet ");
    }
  }
  EXPECT_EQ(Lines(queue_), "40 /v/new 2 /v/quiet 2 /v/log ");
  EXPECT_LE(router_.Flush(at(6001)), start + milliseconds(6500));
  (void)router_.Flush(at(6500));
  EXPECT_EQ(Lines(queue_), "40 /v/new 2 /v/quiet 2 /v/log 2 /v/log ");
  EXPECT_EQ(router_.Flush(at(9000)), QueueRouter::TimePoint::max()) << "nothing is left to wake up for";
}

TEST_F(QueueRouterTest, WhatIsUnreportedOfAnOpenFileFollowsIt) {
  router_.SetQueues({{queue_, {{"/v", kAll}}}});
  const std::vector<std::vector<Change>> kSteps = {
      {Modified("/v/d/f"), Modified("/v/d/gone"), Modified("/v/e"), Modified("/v/closed")},
      {Renamed("/v/d", "/v/n", kFolder), Deleted("/v/n/gone"), Renamed("/v/n/f", "/v/e"), Written("/v/closed")}};
  for (const auto& changes : kSteps) {
    Put(changes);
    (void)router_.Flush(now_);
  }
  EXPECT_EQ(Lines(queue_), "100 /v/d -> /v/n/ 80 /v/n/gone 100 /v/n/f -> /v/e 2 /v/closed ");
  test::WriteFile(queue_, "");
  (void)router_.Flush(now_ + milliseconds(500));
  EXPECT_EQ(Lines(queue_), "2 /v/e ");
  for (int i = 0; i < 10002; ++i) Put({Modified("/v/many/" + std::to_string(i))});
  test::WriteFile(queue_, "");
  (void)router_.Flush(now_);
  EXPECT_EQ(Lines(queue_), "2 /v/many/0 2 /v/many/1 ") << "memory is bounded";
}

TEST_F(QueueRouterTest, WhatCannotBeAppendedIsHeldAndTriedAgain) {
  const std::string queue = dir_ / "missing/queue";
  router_.SetQueues({{queue, {{"/v", kAll}}}});
  EXPECT_EQ(router_.Flush(now_), QueueRouter::TimePoint::max());
  Put({Written("/v/f"), Written("/v/g")});
  std::vector<int64_t> pauses;
  for (int i = 0; i < 8; ++i) {
    const auto next = router_.Flush(now_);
    pauses.push_back((next - now_) / milliseconds(1));
    EXPECT_EQ(router_.Flush(next - milliseconds(1)), next) << "not before its time";
    now_ = next;
  }
  EXPECT_EQ(pauses, (std::vector<int64_t>{100, 200, 400, 800, 1600, 3200, 5000, 5000}));
  QueueFigures figures = router_.Figures()[queue];
  EXPECT_EQ(figures.held_reason, "it cannot be opened: No such file or directory");
  EXPECT_EQ(figures.held, 2U);
  EXPECT_NEAR(static_cast<double>(figures.held_since), static_cast<double>(time(nullptr)), 60);
  EXPECT_EQ(router_.FlushAll(now_), "queue " + queue + ": it cannot be opened: No such file or directory");
  std::filesystem::create_directory(dir_ / "missing");
  EXPECT_EQ(router_.Flush(now_ + milliseconds(5000)), QueueRouter::TimePoint::max());
  EXPECT_EQ(Lines(queue), "2 /v/f 2 /v/g ");
  figures = router_.Figures()[queue];
  EXPECT_TRUE(figures.held == 0 && figures.held_since == 0 && figures.held_reason.empty() && figures.written == 2);
}

TEST_F(QueueRouterTest, ALockThatIsHeldAFullQueueAndAFullDiskHoldLines) {
  router_.SetQueues({{queue_, {{"/v", kAll}}}});
  {
    const LockFile lock(queue_, true);
    Put({Written("/v/f")});
    EXPECT_EQ(router_.FlushAll(now_), "queue " + queue_ + ": its lock is held elsewhere");
    const test::LogCapture log;
    for (int i = 0; i < 20; ++i) (void)router_.Flush(now_ += std::chrono::minutes(1));
    EXPECT_TRUE(test::LogCapture::Contains("its lock is held elsewhere: process " + std::to_string(getpid())));
  }
  test::WriteFile(queue_, "half a li");
  const rlimit full = {40, RLIM_INFINITY};
  (void)signal(SIGXFSZ, SIG_IGN);
  ASSERT_EQ(setrlimit(RLIMIT_FSIZE, &full), 0);
  const std::string failure = router_.FlushAll(now_);
  const rlimit none = {RLIM_INFINITY, RLIM_INFINITY};
  ASSERT_EQ(setrlimit(RLIMIT_FSIZE, &none), 0);
  EXPECT_EQ(failure.rfind("queue " + queue_ + ": it cannot be written: ", 0), 0U) << failure;
  EXPECT_EQ(test::ReadFile(queue_), "half a li") << "what fits of a line is taken back";
  EXPECT_EQ(router_.FlushAll(now_), "");
  EXPECT_EQ(test::ReadFile(queue_).rfind("half a li\n{\"event\":2,", 0), 0U) << "lines are not glued to it";
  std::filesystem::resize_file(queue_, options_.queue_bytes_max);
  Put({Written("/v/f")});
  EXPECT_EQ(router_.FlushAll(now_), "queue " + queue_ + ": it has grown to 64 MiB and nobody empties it");
  std::filesystem::rename(queue_, queue_ + ".tmp");
  EXPECT_EQ(router_.FlushAll(now_), "");
  EXPECT_EQ(Lines(queue_), "2 /v/f ");
}

TEST_F(QueueRouterTest, HeldLinesOfQueuesThatStayAreKept) {
  const LockFile lock(queue_, true);
  const Queues one = {{queue_, {{"/v", kAll}}}};
  router_.SetQueues({{queue_, {{"/v", kAll}}}, {other_, {{"/w", kAll}}}});
  Put({Written("/v/f")});
  router_.SetQueues({{other_, {{"/w", kAll}}}, {queue_, {{"/v/sub", kAll}}}});
  (void)router_.Flush(now_);
  EXPECT_EQ(router_.Figures()[queue_].held, 1U);
  router_.SetQueues({});
  EXPECT_TRUE(router_.Figures().empty());
  EXPECT_EQ(router_.FlushAll(now_), "");
}

TEST_F(QueueRouterTest, TooManyLinesBecomeComparisonsOfFewFolders) {
  options_.held_max = 100;
  QueueRouter router(options_);
  router.SetQueues({{queue_, {{"/v", kAll}, {"/w", kAll}, {"/top", kAll}}}});
  router.Put(Renamed("/w/a/old", "/v/wide/new"), now_);
  router.Put(Attributes("/top"), now_);
  for (int i = 0; i < 1000; ++i) {
    router.Put(Written("/v/wide/" + std::to_string(i % 50) + "/" + std::to_string(i)), now_);
  }
  router.Put(Written("/v/single/file"), now_);
  EXPECT_EQ(router.FlushAll(now_), "");
  EXPECT_EQ(Lines(queue_), "10000 /top/ 10000 /v/wide/ 10000 /w/a/ 2 /v/single/file ");
  for (int i = 0; i < 1000; ++i) router.Put(Attributes("/v/" + std::to_string(i)), now_);
  EXPECT_EQ(router.FlushAll(now_), "");
  EXPECT_NE(Lines(queue_).find("4 /v/0 4 /v/1 "), std::string::npos) << "rights are not to wait for a comparison";
}

TEST_F(QueueRouterTest, PathsThatNobodyCanOpenAreReportedByTheFolderAboveThem) {
  const std::string above = "/v/" + std::string(4000, 'd');
  const std::string deep = above + "/" + std::string(100, 'e');
  EXPECT_EQ(LinesOf({Created(deep, kFolder), Deleted(deep + "/f"), Written(above + "/f")}), "10000 " + above + "/ ");
  EXPECT_EQ(LinesOf({Modified("/v/f"), Renamed("/v/f", deep)}), "80 /v/f 10000 " + above + "/ ");
  EXPECT_EQ(LinesOf({Renamed(deep, "/v/f")}), "10000 " + above + "/ 40 /v/f ");
  EXPECT_EQ(LinesOf({Written(deep), Attributes(deep), Modified(deep)}), "") << "nothing of it is indexed";
}

TEST_F(QueueRouterTest, NamesWithAnyBytesReachTheReader) {
  std::string any;
  for (int byte = 1; byte < 256; ++byte) any += static_cast<char>(byte == '/' ? 'x' : byte);
  const std::string old_path = "/v/\xff\xc3";
  (void)LinesOf({Renamed(old_path, "/v/" + any)});
  const std::string line = test::ReadFile(queue_);
  ASSERT_EQ(line.find('\n'), line.size() - 1);
  const fileindex::Event event(line);
  EXPECT_EQ(event.path, "/v/" + any);
  EXPECT_EQ(event.path_old, old_path);
}

TEST_F(QueueRouterTest, FilesReportedByNumberAreOneLineOrAComparison) {
  const std::string numbered = LinesOf({Written("/v/a"), ByNumber(8), ByNumber(7), ByNumber(8)});
  EXPECT_EQ("2 /v/a 0 /v/ ", numbered);
  EXPECT_NE(std::string::npos, test::ReadFile(queue_).find(R"("data":{"files":[7,8]}})"));
  std::vector<Change> many;
  for (uint64_t file = 1; file <= 20000; ++file) many.push_back(ByNumber(file));
  EXPECT_EQ("10000 /v/ 0 /v/ ", LinesOf(many)) << "in bounded memory";

  (void)remove(queue_.c_str());
  for (int turn = 0; turn < 10; ++turn, now_ += milliseconds(400)) {
    Put({ByNumber(9)});
    (void)router_.Flush(now_);
  }
  EXPECT_EQ("", Lines(queue_)) << "while it is written to";
  Put({{Kind::kAttributesByNumber, false, "/v", {}, 9}});
  (void)router_.Flush(now_ + milliseconds(50));
  EXPECT_EQ("0 /v/ ", Lines(queue_)) << "but for its rights, which are not waited for";
  (void)router_.Flush(now_ + milliseconds(500));
  EXPECT_EQ("0 /v/ 0 /v/ ", Lines(queue_));
}

}  // namespace ferrox::notifyd
