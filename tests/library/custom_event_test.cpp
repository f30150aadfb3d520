#include <sys/resource.h>

#include <csignal>
#include <filesystem>
#include <functional>

#include <gtest/gtest.h>
#include <json/value.h>

#include "common/error.h"
#include "common/json_util.h"
#include "common/lock_file.h"
#include "common/paths.h"
#include "fileindex/optree.h"
#include "fileindex/status_mgr.h"
#include "fileindex/util.h"
#include "sdk/share.h"
#include "tests/support/fake_clock.h"
#include "tests/support/fake_platform.h"
#include "tests/support/log_capture.h"
#include "tests/support/temp_dir.h"

namespace ferrox::fileindex {

namespace {

using test::FakePlatform;
using test::ReadFile;
using test::WriteFile;

int CodeOf(const std::function<void()>& call) {
  try {
    call();
    return 0;
  } catch (const Error& error) {
    return error.Code();
  }
}

class AddCustomEventTest : public testing::Test {
 protected:
  void SetUp() override {
    FakePlatform::Get().Reset();
    FakePlatform::Get().shares["photo"] = {"/v/photo"};
    queue_ = sdk::SDKShare("photo").GetQueuePath();
    for (const std::string& path : {queue_, queue_ + ".tmp", InstancePath(kFileIndexStatusCfgPath)}) {
      (void)std::filesystem::remove(path);
    }
  }

  std::string queue_;
  test::FakeClock clock_;
  test::LogCapture log_;
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
  EXPECT_EQ(Event(ReadFile(queue_).substr(ReadFile(queue_).find('\n') + 1)).path, "/v/photo/new\n\xff\"");
}

TEST_F(AddCustomEventTest, NothingIsQueuedBelowAQueuedReindex) {
  AddCustomEvent(EVENT_REINDEX, "/v/photo/a", "", Json::Value());
  const std::string queued = ReadFile(queue_);
  AddCustomEvent(EVENT_REINDEX, "/v/photo/a/b", "", Json::Value());
  AddCustomEvent(EVENT_UPDATE_CFG, "/v/photo/a", "", Json::Value(Json::objectValue));
  EXPECT_EQ(ReadFile(queue_), queued);
  std::filesystem::rename(queue_, queue_ + ".tmp");  // being worked on counts as queued
  AddCustomEvent(EVENT_REINDEX, "/v/photo/a", "", Json::Value());
  EXPECT_FALSE(std::filesystem::exists(queue_));
  AddCustomEvent(EVENT_REINDEX, "/v/photo/ab", "", Json::Value());
  EXPECT_NE(ReadFile(queue_), "");
}

TEST_F(AddCustomEventTest, AHalfWrittenLineIsNotContinued) {
  AddCustomEvent(EVENT_REINDEX, "/v/photo/a", "", Json::Value());
  const std::string whole = ReadFile(queue_);
  const std::string half = R"({"event":64,"path":"/v/photo/x"})";
  WriteFile(queue_, half);
  AddCustomEvent(EVENT_REINDEX, "/v/photo/a", "", Json::Value());
  EXPECT_EQ(ReadFile(queue_), half + "\n" + whole);
}

TEST_F(AddCustomEventTest, FailuresMarkTheShare) {
  const auto add = [] { AddCustomEvent(EVENT_REINDEX, "/v/photo/a", "", Json::Value()); };
  const auto check = [this](int code, const std::string& share) {
    EXPECT_EQ(StatusMgr().GetShareStatus(share), StatusMgr::kNeedReindex);
    EXPECT_TRUE(log_.Contains("(AddCustomEvent) AddCustomEvent failed, code=" + std::to_string(code)));
    EXPECT_NE(log_.Lines().back().find(". Set [" + share + "] need reindex"), std::string::npos) << log_.Lines().back();
    SetUp();
  };
  {
    const LockFile held(queue_, true);
    EXPECT_EQ(CodeOf(add), Error::kLockFailed);
  }
  check(506, "photo");
  WriteFile(queue_, "no event\n");
  EXPECT_EQ(CodeOf(add), Error::kMalformedEvent);
  check(906, "photo");
  FakePlatform::Get().failing["KOVAShareGet"] = {};
  EXPECT_EQ(CodeOf(add), Error::kNoSuchShare);
  check(800, "photo");
  EXPECT_EQ(CodeOf([] { AddCustomEvent(EVENT_REINDEX, "/elsewhere", "", Json::Value()); }), Error::kInternal);
  check(502, "");
  const Json::Value huge = std::string(kQueueLineMaxBytes, 'x');
  EXPECT_EQ(CodeOf([&huge] { AddCustomEvent(EVENT_UPDATE_CFG, "/v/photo/a", "", huge); }), Error::kInternal);
  check(502, "photo");
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
    EXPECT_EQ(CodeOf([] { AddCustomEvent(EVENT_REINDEX, "/v/photo/a", "", Json::Value()); }), Error::kInternal);
    ASSERT_EQ(setrlimit(RLIMIT_FSIZE, &unlimited), 0);
    EXPECT_EQ(ReadFile(queue_), before);
    EXPECT_TRUE(log_.Contains("reason: Failed to write queue, reason="));
  }
}

}  // namespace ferrox::fileindex
