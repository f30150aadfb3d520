// Catches answers that differ from what open() allows a user, and ids that another thread gets or that are not taken.
#include <fcntl.h>
#include <grp.h>
#include <sys/mount.h>
#include <sys/stat.h>
#include <sys/wait.h>
#include <sys/xattr.h>
#include <unistd.h>

#include <algorithm>
#include <csignal>
#include <filesystem>
#include <fstream>
#include <random>
#include <thread>

#include <gtest/gtest.h>

#include <kova/content_extract.h>

#include "common/error.h"
#include "common/paths.h"
#include "services/kova-access/access_server.h"
#include "tests/contract/in_child.h"
#include "tests/support/temp_dir.h"
#include "wire/live_files.h"

namespace ferrox::access {
namespace {

namespace fs = std::filesystem;
constexpr std::chrono::seconds kLongest(20);
const std::vector<User> kUsers = {{50001, {60001}}, {50002, {60001, 60002}}, {50003, {60003, 0}}, {50004, {60002}}};

std::string StampOf(const std::string& path) {
  struct stat status = {};
  return lstat(path.c_str(), &status) == 0 ? KOVA::CONTENT_EXTRACT::Stamp(status) : "";
}

class AccessProcessTest : public testing::Test {
 protected:
  void SetUp() override {
    if (geteuid() != 0) GTEST_SKIP() << "only root can take on the ids of others";
    chmod(dir_.Path().c_str(), 0711);
    services::FrameServerOptions options;
    options.socket_path = InstancePath(kAccessSocket);
    server_ = std::make_unique<services::FrameServer>(
        options, [this](const std::string& text, const services::Peer& peer) { return access_.Handle(text, peer); });
    thread_ = std::thread([this] { server_->Run(-1); });
  }
  void TearDown() override {
    if (server_ != nullptr) server_->Stop();
    if (thread_.joinable()) thread_.join();
  }
  size_t Pick(size_t below) { return std::uniform_int_distribution<size_t>(0, below - 1)(random_); }

  /// Owner, group, mode, and now and then an ACL, mostly of the users above.
  void SetRights(const std::string& path, bool is_folder) {
    constexpr uid_t kOwners[] = {0, 50001, 50002, 50004};
    constexpr gid_t kGroups[] = {0, 60001, 60002, 60003};
    ASSERT_EQ(0, chown(path.c_str(), kOwners[Pick(4)], kGroups[Pick(4)]));
    const auto bits = [&] { return static_cast<mode_t>(Pick(3) == 0 ? Pick(8) : is_folder ? 5 + 2 * Pick(2) : 4); };
    ASSERT_EQ(0, chmod(path.c_str(), static_cast<mode_t>(bits() << 6 | bits() << 3 | bits() | Pick(8) << 9)));
    if (Pick(3) != 0) return;
    struct Entry {
      uint16_t tag, allowed;
      uint32_t id;
    };
    const auto rights = [&] { return static_cast<uint16_t>(Pick(8)); };
    const Entry entries[] = {{0x01, rights(), UINT32_MAX}, {0x02, rights(), 50001},     {0x02, rights(), 50003},
                             {0x04, rights(), UINT32_MAX}, {0x08, rights(), 60001},     {0x08, rights(), 60002},
                             {0x10, rights(), UINT32_MAX}, {0x20, rights(), UINT32_MAX}};
    const uint32_t version = 2;
    std::string acl(reinterpret_cast<const char*>(&version), sizeof(version));
    acl.append(reinterpret_cast<const char*>(entries), sizeof(entries));
    const int set = setxattr(path.c_str(), "system.posix_acl_access", acl.data(), acl.size(), 0);
    EXPECT_TRUE(set == 0 || errno == ENOTSUP);
  }
  /// Fills `paths_` with what can be opened, and `never_` with what must not be, whatever its rights.
  void MakeTree(const std::string& folder, int depth) {
    for (int i = 0; i < 5; ++i) {
      const std::string path = folder + "/" + std::to_string(i) + " \n\xff";
      const size_t kind = Pick(8);
      if (kind < 3 && depth > 0) {
        fs::create_directory(path);
        MakeTree(path, depth - 1);
      } else if (kind == 7) {
        ASSERT_EQ(0, mknod(path.c_str(), (Pick(2) == 0 ? S_IFIFO : S_IFSOCK) | 0777, 0));
      } else {
        test::WriteFile(path, "text");
      }
      (kind == 7 ? never_ : paths_).push_back(path);
      SetRights(path, kind < 3 && depth > 0);
    }
    fs::create_symlink("..", folder + "/link");
    never_.insert(never_.end(), {folder + "/link", folder + "/link/share", folder + "/../share/0", folder + "/none"});
  }
  /// What the kernel lets a process of that user open: '1' or '0' for each path.
  static std::string OpenedByProcess(const User& user, const std::vector<std::string>& paths, int flags) {
    int ends[2] = {};
    EXPECT_EQ(0, pipe(ends));
    const pid_t child = fork();
    if (child == 0) {
      const bool is_user = setgroups(user.groups.size(), user.groups.data()) == 0 && setgid(user.groups.front()) == 0 &&
                           setuid(user.uid) == 0;
      for (const std::string& path : paths) {
        const base::UniqueFd file(open(path.c_str(), flags));
        (void)!write(ends[1], is_user && file.Valid() ? "1" : "0", 1);
      }
      _exit(0);
    }
    (void)close(ends[1]);
    std::string opened(paths.size(), '?');
    for (char& one : opened) (void)!read(ends[0], &one, 1);
    (void)close(ends[0]);
    (void)waitpid(child, nullptr, 0);
    return opened;
  }
  void ExpectAsKernel(const User& user) {
    const std::string opened = OpenedByProcess(user, paths_, O_RDONLY | O_NONBLOCK);
    readable_ += std::count(opened.begin(), opened.end(), '1');
    unreadable_ += std::count(opened.begin(), opened.end(), '0');
    std::vector<std::string> asked = paths_;
    asked.insert(asked.end(), never_.begin(), never_.end());
    const auto files = wire::LookAs(user.uid, user.groups, root_, asked, kLongest);
    ASSERT_EQ(asked.size(), files.size());
    for (size_t i = 0; i < files.size(); ++i) {
      const bool expected = i < paths_.size() && opened[i] == '1';
      EXPECT_EQ(expected, files[i].readable) << asked[i] << " by " << user.uid;
      EXPECT_EQ(expected || files[i].entered ? StampOf(asked[i]) : "", files[i].stamp) << asked[i];
      EXPECT_EQ(expected && fs::is_directory(asked[i]), files[i].readable && files[i].folder) << asked[i];
    }
    EXPECT_EQ(OpenedByProcess(user, {root_ + "/."}, O_PATH) == "1", files[0].entered);
    EXPECT_EQ(opened[1] == '1', wire::OpenAs(user.uid, user.groups, root_, asked[1], kLongest).Valid());
  }

  test::TempDir dir_;
  std::string root_ = dir_ / "above/share";
  std::vector<std::string> paths_ = {root_}, never_;
  int64_t readable_ = 0, unreadable_ = 0;
  std::mt19937 random_{7};
  AccessServer access_{services::OpenLimit::Options{}};
  std::unique_ptr<services::FrameServer> server_;
  std::thread thread_;
};

TEST_F(AccessProcessTest, ItOpensWhatTheKernelLetsAProcessOfTheUserOpen) {
  fs::create_directories(root_);
  MakeTree(root_, 4);
  for (int round = 0; round < 12; ++round) {
    for (const User& user : kUsers) ExpectAsKernel(user);
    SetRights(root_, true);
    if (round % 3 == 2) SetRights(dir_ / "above", true);
    for (size_t i = 0; i < paths_.size(); i += 7) SetRights(paths_[i], fs::is_directory(paths_[i]));
  }
  EXPECT_LT(500, std::min(readable_, unreadable_)) << "neither is rare";
}

TEST_F(AccessProcessTest, OnlyTheThreadAtWorkHasTheIds) {
  const auto line = [](const fs::path& task, const std::string& name) {
    std::ifstream status(task / "status");
    for (std::string text; std::getline(status, text);) {
      if (text.starts_with(name + ":\t")) return text.substr(name.size() + 2);
    }
    return std::string();
  };
  RunAsUser(kUsers[1], [&] {
    const std::string own = std::to_string(gettid());
    for (const auto& task : fs::directory_iterator("/proc/self/task")) {
      const bool is_own = task.path().filename() == own;
      EXPECT_EQ(is_own ? "0\t50002\t0\t50002" : "0\t0\t0\t0", line(task, "Uid")) << "only the effective one";
      EXPECT_EQ(is_own, line(task, "Gid") == "60001\t60001\t60001\t60001");
      EXPECT_EQ(is_own, line(task, "Groups") == "60001 60002 ");
      for (const char* set : {"CapPrm", "CapEff"}) EXPECT_EQ(is_own, line(task, set) == "0000000000000000");
      EXPECT_TRUE(!is_own || line(task, "CapInh") == "0000000000000000");
    }
  });
  for (const User& user : {User{50001, {}}, User{UINT32_MAX, {1}}, User{50001, {UINT32_MAX}}}) {
    EXPECT_THROW(RunAsUser(user, [] { ADD_FAILURE() << "has begun"; }), Error);
  }
}

TEST_F(AccessProcessTest, WhatCannotBeToldIsAFailure) {
  const auto code = [](uint32_t uid, const std::vector<uint32_t>& groups) {
    try {
      (void)wire::LookAs(uid, groups, "/", {"/"}, kLongest);
      return 0;
    } catch (const Error& error) {
      return static_cast<int>(error.Code());
    }
  };
  EXPECT_EQ(0, code(50001, {60001}));
  EXPECT_EQ(Error::kEngineRightsUnknown, code(0, {0})) << "root is not asked for";
  EXPECT_EQ(Error::kEngineRightsUnknown, code(50001, {}));
  EXPECT_EQ(Error::kEngineRightsUnknown, code(50001, {UINT32_MAX}));
  const std::string look = R"({"type":"look","data":{"uid":50001,"groups":[60001],"root":"/","paths":["/"]}})";
  EXPECT_EQ(std::string::npos, access_.Handle(look, {50001, 60001}).body.find("files")) << "it obeys root alone";
  TearDown();
  server_.reset();
  EXPECT_EQ(Error::kEngineRightsUnknown, code(50001, {60001}));
}

TEST(LiveShareTest, OtherMountsAndLeasedFiles) {
  if (geteuid() != 0) GTEST_SKIP() << "only root can take on the ids of others";
  const test::TempDir dir;
  const std::string root = dir / "share";
  fs::create_directories(root + "/mounted");
  chmod(dir.Path().c_str(), 0711);
  const bool could_mount = test::InChild(true, [&] {
    ASSERT_EQ(0, mount("none", (root + "/mounted").c_str(), "tmpfs", 0, "mode=0777"));
    test::WriteFile(root + "/mounted/f", "");
    test::WriteFile(root + "/leased", "");
    const base::UniqueFd leased(open((root + "/leased").c_str(), O_RDWR | O_CLOEXEC));
    (void)signal(SIGIO, SIG_IGN);
    ASSERT_EQ(0, fcntl(leased.Get(), F_SETLEASE, F_WRLCK));
    const OwnDescriptors descriptors;
    RunAsUser(kUsers[0], [&] {
      const LiveShare share(descriptors, root);
      EXPECT_TRUE(share.Look(root).entered);
      EXPECT_FALSE(share.Look(root + "/mounted").readable);
      EXPECT_FALSE(share.Look(root + "/mounted/f").readable);
      EXPECT_TRUE(share.Look(root + "/leased").readable) << "what holds the lease has to give it up";
    });
  });
  if (!could_mount) GTEST_SKIP() << "this system does not let the test mount anything";
}

}  // namespace
}  // namespace ferrox::access
