#include "fileindex/status_mgr.h"

#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>
#include <filesystem>
#include <functional>

#include <gtest/gtest.h>

#include "common/error.h"
#include "common/lock_file.h"
#include "common/paths.h"
#include "tests/support/fake_clock.h"
#include "tests/support/fake_platform.h"
#include "tests/support/log_capture.h"
#include "tests/support/temp_dir.h"
#include "tests/support/unix_server.h"

namespace ferrox::fileindex {

namespace {

using test::FakePlatform;

int CodeOf(const std::function<void()>& call) {
  try {
    call();
    return 0;
  } catch (const Error& error) {
    return error.Code();
  }
}

class StatusMgrTest : public testing::Test {
 protected:
  void SetUp() override {
    FakePlatform::Get().Reset();
    (void)std::filesystem::remove_all(path_);
  }
  void Write(const std::string& text) { test::WriteFile(path_, text); }
  std::string Content() { return test::ReadFile(path_); }
  /// What the daemon is sent by `change`.
  static std::string SentBy(const std::function<void()>& change) {
    std::string request(200, '\0');
    {
      const test::UnixServer daemon(InstancePath(kFileIndexdSocket), [&request](int fd) {
        uint32_t size = 0;
        EXPECT_EQ(read(fd, &size, sizeof(size)), 4);
        EXPECT_EQ(read(fd, request.data(), request.size()), static_cast<ssize_t>(size));
        EXPECT_EQ(write(fd, "\0\0\0\0", 4), 4);
      });
      change();
    }
    return request.c_str();
  }

  const std::string path_ = InstancePath(kFileIndexStatusCfgPath);
  test::FakeClock clock_;
  test::LogCapture log_;
};

}  // namespace

TEST_F(StatusMgrTest, BitsOfShares) {
  EXPECT_EQ(StatusMgr().GetShareStatus("photo"), 0);
  StatusMgr().SetShareStatus("photo", 1);
  StatusMgr().SetShareStatus("photo", 2);
  StatusMgr().SetShareStatus("my \"share\"/\xff", 1);
  EXPECT_EQ(StatusMgr().GetShareStatus("photo"), 3);
  EXPECT_EQ(StatusMgr().GetShareStatus("my \"share\"/\xff"), 1);
  StatusMgr().UnsetShareStatus("photo", 1);
  StatusMgr().UnsetShareStatus("music", 3);
  StatusMgr().ClearShareStatus("my \"share\"/\xff");
  EXPECT_EQ(Content(), "{\"share\":{\"music\":0,\"photo\":2}}\n");
  (void)std::filesystem::remove(path_);
  StatusMgr().ClearShareStatus("unknown");
  EXPECT_EQ(Content(), "{\"share\":null}\n") << "written all the same";
  EXPECT_EQ(StatusMgr().GetShareStatus("unknown"), 0);
}

TEST_F(StatusMgrTest, SavesAsRootForEverybodyToRead) {
  FakePlatform& platform = FakePlatform::Get();
  platform.users["web"] = {33, 33, false, "", 0};
  platform.euid = 33;
  platform.egid = 33;
  Write("{}");
  ASSERT_EQ(chmod(path_.c_str(), 0600), 0);
  StatusMgr().SetShareStatus("photo", 1);
  EXPECT_EQ(platform.switches, (std::vector<std::string>{"root", "web"}));
  struct stat status = {};
  ASSERT_EQ(stat(path_.c_str(), &status), 0);
  EXPECT_EQ(status.st_mode & 0777, 0644U);
}

TEST_F(StatusMgrTest, UnusableFilesCannotBeLoaded) {
  for (const char* bad : {"", "{", "{} x", "[]", "7", R"({"share":[]})", R"({"share":1})"}) {
    Write(bad);
    errno = 0;
    EXPECT_EQ(CodeOf([] { StatusMgr(); }), Error::kLoadFailed) << bad;
    EXPECT_NE(log_.Lines().back().find("(StatusMgr) Failed [IsFileExist(kFileIndexStatusCfgPath) && "
                                       "!data_.fromFile(kFileIndexStatusCfgPath)], reason: Cannot load json: " +
                                       path_),
              std::string::npos)
        << log_.Lines().back();
  }
  for (const char* odd : {"null", R"({"resume_time":1.5})", R"({"resume_time":"5","share":{"photo":"x"}})"}) {
    Write(odd);
    EXPECT_EQ(StatusMgr().GetPauseInfo(), -1) << odd;
    EXPECT_EQ(StatusMgr().GetShareStatus("photo"), 0) << odd;
  }
}

TEST_F(StatusMgrTest, PauseAndResumeAreStoredAndTold) {
  struct Row {
    int hours;
    long long deadline;
  };
  // The deadline is counted in 32 bits: 400,000 hours from now it has wrapped.
  for (const Row& row : {Row{0, 0}, Row{2, 1700007200}, Row{400000, 1700000000LL + 3600LL * 400000 - (1LL << 32)}}) {
    const std::string text = "{\"resume_time\":" + std::to_string(row.deadline) + "}";
    EXPECT_EQ(SentBy([&] { StatusMgr().Pause(row.hours); }), "{\"data\":" + text + ",\"type\":\"pause\"}");
    EXPECT_EQ(Content(), text + "\n");
    EXPECT_EQ(StatusMgr().GetPauseInfo(), row.deadline);
  }
  EXPECT_EQ(SentBy([] { StatusMgr().Resume(); }), R"({"data":null,"type":"resume"})");
  EXPECT_EQ(Content(), "{\"resume_time\":-1}\n");
}

TEST_F(StatusMgrTest, WhatFailsWhen) {
  EXPECT_EQ(CodeOf([] { StatusMgr().Pause(-1); }), Error::kBadArgument);
  EXPECT_TRUE(log_.Contains("Pause length should NOT be negative"));
  EXPECT_FALSE(std::filesystem::exists(path_));
  EXPECT_EQ(CodeOf([] { StatusMgr().Pause(1); }), Error::kInternal);
  EXPECT_EQ(StatusMgr().GetPauseInfo(), 1700003600) << "recorded, although nobody could be told";
  {
    const LockFile held(InstancePath(kStatusLockPath), true);
    EXPECT_EQ(CodeOf([] { StatusMgr().SetShareStatus("photo", 1); }), Error::kLockFailed);
  }
  std::filesystem::create_directories(path_ + ".new");  // no file can be written beside
  EXPECT_EQ(CodeOf([] { StatusMgr().SetShareStatus("photo", 1); }), Error::kSaveFailed);
  EXPECT_TRUE(log_.Contains("[!data_.toFile(kFileIndexStatusCfgPath)], reason: Failed to save json: " + path_));
  (void)std::filesystem::remove(path_ + ".new");
  EXPECT_EQ(StatusMgr().GetPauseInfo(), 1700003600) << "the old file stays";
  FakePlatform::Get().failing["ResetCredentialsByName"] = {};
  EXPECT_EQ(CodeOf([] { StatusMgr().SetShareStatus("photo", 1); }), Error::kCredentialsFailed);
}

}  // namespace ferrox::fileindex
