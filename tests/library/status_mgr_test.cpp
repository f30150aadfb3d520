// Catches marks and pauses that are lost, not told, or readable by root alone.
#include "fileindex/status_mgr.h"

#include <unistd.h>

#include "common/lock_file.h"
#include "tests/support/library_test.h"
#include "tests/support/unix_server.h"

namespace ferrox::fileindex {

namespace {

namespace fs = std::filesystem;
using test::FailureOf;

class StatusMgrTest : public test::LibraryTest {
 protected:
  void SetUp() override { (void)fs::remove_all(path_); }
  void Write(const std::string& text) { test::WriteFile(path_, text); }
  std::string Content() { return test::ReadFile(path_); }
  /// What the daemon is sent by `change`.
  static std::string SentBy(const std::function<void()>& change) {
    std::string request(200, '\0');
    {
      const test::UnixServer daemon(InstancePath(kFileIndexdSocket), [&request](int fd) {
        EXPECT_EQ(read(fd, request.data(), 4), 4);
        EXPECT_GT(read(fd, request.data(), request.size()), 0);
        EXPECT_EQ(write(fd, "\0\0\0\0", 4), 4);
      });
      change();
    }
    return request.c_str();
  }

  const std::string path_ = InstancePath(kFileIndexStatusCfgPath);
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
  (void)fs::remove(path_);
  StatusMgr().ClearShareStatus("unknown");
  EXPECT_EQ(Content(), "{\"share\":null}\n") << "written all the same";
  EXPECT_EQ(StatusMgr().GetShareStatus("unknown"), 0);
}

TEST_F(StatusMgrTest, SavesAsRootForEverybodyToRead) {
  platform_.users["web"] = {33, 33, false, "", 0};
  platform_.euid = platform_.egid = 33;
  Write("{}");
  fs::permissions(path_, fs::perms(0600));
  StatusMgr().SetShareStatus("photo", 1);
  EXPECT_EQ(platform_.switches, (std::vector<std::string>{"root", "web"}));
  EXPECT_EQ(fs::status(path_).permissions(), fs::perms(0644));
}

TEST_F(StatusMgrTest, UnusableFilesCannotBeLoaded) {
  for (const char* bad : {"", "{", "{} x", "[]", "7", R"({"share":[]})", R"({"share":1})"}) {
    Write(bad);
    EXPECT_EQ(FailureOf([] { StatusMgr(); }), "504 Cannot load json: " + path_) << bad;
    EXPECT_TRUE(
        log_.Contains("(StatusMgr) Failed [IsFileExist(kFileIndexStatusCfgPath) && "
                      "!data_.fromFile(kFileIndexStatusCfgPath)], reason: Cannot load json: " +
                      path_));
  }
  for (const char* odd : {"null", R"({"resume_time":1.5})", R"({"resume_time":"5","share":{"photo":"x"}})"}) {
    Write(odd);
    EXPECT_EQ(StatusMgr().GetPauseInfo(), -1) << odd;
    EXPECT_EQ(StatusMgr().GetShareStatus("photo"), 0) << odd;
  }
}

TEST_F(StatusMgrTest, PauseAndResumeAreStoredAndTold) {
  // The deadline is counted in 32 bits: 400,000 hours from now it has wrapped.
  for (const auto& [hours, deadline] :
       {std::pair{0, 0LL}, {2, 1700007200}, {400000, 1700000000LL + 3600LL * 400000 - (1LL << 32)}}) {
    const std::string text = "{\"resume_time\":" + std::to_string(deadline) + "}";
    EXPECT_EQ(SentBy([hours = hours] { StatusMgr().Pause(hours); }), "{\"data\":" + text + ",\"type\":\"pause\"}");
    EXPECT_EQ(Content(), text + "\n");
    EXPECT_EQ(StatusMgr().GetPauseInfo(), deadline);
  }
  EXPECT_EQ(SentBy([] { StatusMgr().Resume(); }), R"({"data":null,"type":"resume"})");
  EXPECT_EQ(Content(), "{\"resume_time\":-1}\n");
}

TEST_F(StatusMgrTest, WhatFailsWhen) {
  const auto set = [] { StatusMgr().SetShareStatus("photo", 1); };
  EXPECT_EQ(FailureOf([] { StatusMgr().Pause(-1); }), "120 Pause length should NOT be negative");
  EXPECT_FALSE(fs::exists(path_));
  EXPECT_EQ(FailureOf([] { StatusMgr().Pause(1); }).substr(0, 3), "502");
  EXPECT_EQ(StatusMgr().GetPauseInfo(), 1700003600) << "recorded, although nobody could be told";
  {
    const LockFile held(InstancePath(kStatusLockPath), true);
    EXPECT_EQ(FailureOf(set).substr(0, 3), "506");
  }
  fs::create_directories(path_ + ".new");  // no file can be written beside
  EXPECT_EQ(FailureOf(set), "505 Failed to save json: " + path_);
  EXPECT_TRUE(log_.Contains("[!data_.toFile(kFileIndexStatusCfgPath)], reason: Failed to save json: " + path_));
  (void)fs::remove(path_ + ".new");
  EXPECT_EQ(StatusMgr().GetPauseInfo(), 1700003600) << "the old file stays";
}

}  // namespace ferrox::fileindex
