// Catches queued lines that are torn, doubled or lost without the share being marked for a reindex.
#include "fileindex/queue/custom_event.h"

#include <sys/resource.h>

#include <csignal>
#include <memory>
#include <random>

#include "common/lock_file.h"
#include "fileindex/queue/event.h"
#include "fileindex/status_mgr.h"
#include "fileindex/util.h"
#include "sdk/share.h"
#include "tests/support/library_test.h"
#include "tests/support/queue_lines.h"

namespace ferrox::fileindex {

namespace {

namespace fs = std::filesystem;
using test::ReadFile;
using test::WriteFile;

class AddCustomEventTest : public test::LibraryTest {
 protected:
  void SetUp() override {
    platform_.Reset();
    platform_.shares["photo"] = {"/v/photo"};
    queue_ = sdk::SDKShare("photo").GetQueuePath();
    for (const std::string& path : {queue_, queue_ + ".tmp", InstancePath(kFileIndexStatusCfgPath)}) {
      (void)fs::remove(path);
    }
  }
  /// Queues a reindex; how that fails.
  static std::string Add(const std::string& path, const Json::Value& data = {}) {
    return test::FailureOf([&] { AddCustomEvent(EVENT_REINDEX, path, "", data); });
  }

  std::string queue_;
};

}  // namespace

TEST_F(AddCustomEventTest, LinesHoldAllFourMembers) {
  Json::Value flags;
  flags["photo"] = true;
  AddCustomEvent(EVENT_UPDATE_CFG, "/v/photo/a", "", flags);
  AddCustomEvent(EVENT_RENAME, "/v/photo/new\n\xff\"", "/v/photo/old", Json::Value());
  EXPECT_EQ(ReadFile(queue_),
            "{\"data\":{\"photo\":true},\"event\":131072,\"path\":\"/v/photo/a\",\"path_old\":\"\"}\n"
            "{\"data\":null,\"event\":256,\"path\":\"/v/photo/new\\n\xff\\\"\",\"path_old\":\"/v/photo/old\"}\n");
}

TEST_F(AddCustomEventTest, NothingIsQueuedBelowAQueuedReindex) {
  EXPECT_EQ(Add("/v/photo/a"), "");
  const std::string queued = ReadFile(queue_);
  EXPECT_EQ(Add("/v/photo/a/b"), "");
  AddCustomEvent(EVENT_UPDATE_CFG, "/v/photo/a", "", Json::Value(Json::objectValue));
  EXPECT_EQ(ReadFile(queue_), queued);
  fs::rename(queue_, queue_ + ".tmp");  // being worked on counts as queued
  EXPECT_EQ(Add("/v/photo/a"), "");
  EXPECT_FALSE(fs::exists(queue_));
  EXPECT_EQ(Add("/v/photo/ab"), "");
  EXPECT_TRUE(fs::exists(queue_));
}

TEST_F(AddCustomEventTest, AHalfWrittenLineIsNotContinued) {
  const std::string half = R"({"event":64,"path":"/v/photo/x"})";
  WriteFile(queue_, half);
  EXPECT_EQ(Add("/v/photo/a"), "");
  EXPECT_EQ(ReadFile(queue_).rfind(half + "\n{\"data\":null", 0), 0U);
}

TEST_F(AddCustomEventTest, FailuresMarkTheShare) {
  struct Row {
    const char *code, *path, *share;
    std::function<void()> prepare;
    Json::Value data = {};
  };
  std::unique_ptr<LockFile> held;
  for (const Row& row : {
           Row{"506", "/v/photo/a", "photo", [&] { held = std::make_unique<LockFile>(queue_, true); }},
           Row{"906", "/v/photo/a", "photo", [&] { WriteFile(queue_, "no event\n"); }},
           Row{"800", "/v/photo/a", "photo", [&] { platform_.failing["KOVAShareGet"] = {}; }},
           Row{"502", "/elsewhere", "", [] {}},
           Row{"502", "/v/photo/a", "photo", [] {}, std::string(kQueueLineMaxBytes, 'x')},
       }) {
    SetUp();
    row.prepare();
    EXPECT_EQ(Add(row.path, row.data).substr(0, 3), row.code);
    EXPECT_EQ(StatusMgr().GetShareStatus(row.share), StatusMgr::kNeedReindex);
    EXPECT_TRUE(log_.Contains(std::string("AddCustomEvent failed, code=") + row.code));
    EXPECT_TRUE(log_.Contains(std::string(". Set [") + row.share + "] need reindex"));
    held.reset();
  }
}

// A limit on the size of files stands for the full disk: the write that reaches it is cut short.
TEST_F(AddCustomEventTest, AShortWriteIsTakenBack) {
  const std::string before = R"({"event":64,"path":"/v/photo/x"})"
                             "\n";
  WriteFile(queue_, before);
  (void)signal(SIGXFSZ, SIG_IGN);
  struct rlimit unlimited = {};
  ASSERT_EQ(getrlimit(RLIMIT_FSIZE, &unlimited), 0);
  for (const rlim_t room : {before.size() + 10, before.size()}) {
    const struct rlimit tight = {room, unlimited.rlim_max};
    ASSERT_EQ(setrlimit(RLIMIT_FSIZE, &tight), 0);
    EXPECT_EQ(Add("/v/photo/a").substr(0, 3), "502");
    ASSERT_EQ(setrlimit(RLIMIT_FSIZE, &unlimited), 0);
    EXPECT_EQ(ReadFile(queue_), before);
  }
}

TEST_F(AddCustomEventTest, AWriterQueuesWhatEventsOneByOneWould) {
  std::mt19937 random(20);
  const auto path = [&random] {
    std::string text = "/v/photo";
    for (unsigned depth = random() % 3; depth > 0; --depth) text += random() % 2 == 0 ? "/a" : "/b";
    return random() % 40 == 0 ? "/elsewhere" : text;
  };
  for (int round = 0; round < 60; ++round) {
    std::string live, detached;
    for (std::string* queue : {&live, &detached}) {
      if (random() % 4 == 0) *queue = test::Line(random() % 2 == 0 ? EVENT_REINDEX : EVENT_CREATE, path()) + "\n";
      if (random() % 8 == 0) *queue += "no event\n";
    }
    std::vector<std::pair<int, std::string>> events(5);
    for (auto& event : events) event = {random() % 4 == 0 ? EVENT_REINDEX : EVENT_UPDATE_CFG, path()};
    std::string results[2];
    for (const bool one_by_one : {false, true}) {
      SetUp();
      WriteFile(queue_, live);
      WriteFile(queue_ + ".tmp", detached);
      results[one_by_one] = test::FailureOf([&] {
        CustomEventWriter writer;
        for (const auto& [event, at] : events) {
          one_by_one ? AddCustomEvent(event, at, "", Json::Value()) : writer.Add(event, at, "", Json::Value());
        }
      });
      results[one_by_one] += "\n" + ReadFile(queue_) + ReadFile(InstancePath(kFileIndexStatusCfgPath));
    }
    EXPECT_EQ(results[0], results[1]) << "round " << round;
  }
}

}  // namespace ferrox::fileindex
