#include "services/kovanotifyd/queue_router.h"

#include <sstream>

#include <gtest/gtest.h>

#include "fileindex/optree.h"
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

}  // namespace ferrox::notifyd
