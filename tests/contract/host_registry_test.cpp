// What the Linux host keeps of MonitorQueue on disk, and what its reader makes of it.

#include <signal.h>
#include <sys/stat.h>
#include <sys/wait.h>
#include <unistd.h>

#include <filesystem>
#include <string>

#include <gtest/gtest.h>

#include <kova/error.h>
#include <kova/notifyd.h>

#include "platform/host/notify_registry.h"
#include "tests/contract/host_log.h"
#include "tests/support/temp_dir.h"

namespace ferrox::test {
namespace {

using kova::host::ReadRegistrations;
using kova::host::RegistryFolder;
using KOVA::KOVANOTIFYD::MonitorQueue;
using std::string;

class HostRegistryTest : public testing::Test {
 protected:
  void SetUp() override {
    std::filesystem::remove_all(RegistryFolder());
    std::filesystem::remove(RegistryFolder() + ".lock");
  }

  static Json::Value Document(const string& queue, int folders) {
    Json::Value document;
    document["queue"] = queue;
    document["config"] = Json::arrayValue;
    for (int i = 0; i < folders; ++i) {
      Json::Value watch;
      watch["path"] = "/v/share/folder number " + std::to_string(i);
      watch["mask"] = 65478;
      watch["ignore"].append("@eaDir");
      document["config"].append(watch);
    }
    return document;
  }
  static bool Upsert(const string& queue, int folders) {
    return MonitorQueue::Upsert(MonitorQueue(Document(queue, folders)), "fileindex", 1);
  }
  static string OnlyFile() {
    string found;
    for (const auto& entry : std::filesystem::directory_iterator(RegistryFolder())) {
      EXPECT_EQ("", found) << entry.path();
      found = entry.path();
    }
    return found;
  }
  static ino_t Inode(const string& path) {
    struct stat info = {};
    EXPECT_EQ(0, stat(path.c_str(), &info)) << path;
    return info.st_ino;
  }

  HostLog log_;
};

TEST_F(HostRegistryTest, OnlyAChangeIsWritten) {
  EXPECT_TRUE(ReadRegistrations().problems.empty()) << "there is no folder yet";
  ASSERT_TRUE(Upsert("/q/a", 2));
  const string file = OnlyFile();
  const ino_t first = Inode(file);
  ASSERT_TRUE(Upsert("/q/a", 2));
  EXPECT_EQ(first, Inode(file));
  ASSERT_TRUE(Upsert("/q/a", 3));
  EXPECT_NE(first, Inode(file));
  WriteFile(file + ".Xy12ab", "half of somethi");
  EXPECT_EQ(1U, ReadRegistrations().list.size());
  EXPECT_TRUE(ReadRegistrations().problems.empty()) << "what a killed writer leaves is no registration";
  Json::Value by_hand = Document("/q/a", 2);
  by_hand["config"][0]["path"] = "/v/share/trip/";
  ASSERT_TRUE(MonitorQueue::Upsert(MonitorQueue(by_hand), "fileindex", 1));
  EXPECT_EQ(1U, ReadRegistrations().list[0].watches.size());
  EXPECT_EQ(1, HostLog::Count("the folder /v/share/trip/ is not watched for /q/a: its path ends in"));
}

TEST_F(HostRegistryTest, ADamagedFileIsNamedAndReplaced) {
  ASSERT_TRUE(Upsert("/q/good", 1));
  const string good = OnlyFile();
  ASSERT_TRUE(Upsert("/q/bad", 1));
  std::filesystem::path bad;
  for (const auto& entry : std::filesystem::directory_iterator(RegistryFolder())) {
    if (entry.path() != good) bad = entry.path();
  }
  for (const string& damage : {string(), string("null"), string("{\"queue\":\"/q/bad\",\"conf"), string(1000, '\0'),
                               ReadFile(good), string(3000, '[')}) {
    WriteFile(bad, damage);
    const auto before = ReadRegistrations();
    ASSERT_EQ(1U, before.list.size()) << "the others are used all the same";
    EXPECT_EQ("/q/good", before.list[0].queue);
    EXPECT_NE(string::npos, before.problems.at(0).find(bad.string()));
    log_.Lines().clear();
    EXPECT_TRUE(Upsert("/q/bad", 1));
    ASSERT_EQ(1U, log_.Lines().size());
    EXPECT_EQ(2U, ReadRegistrations().list.size());
    EXPECT_TRUE(ReadRegistrations().problems.empty());
    EXPECT_EQ(damage, ReadFile(bad.string() + ".damaged"));
    WriteFile(bad, damage);
    EXPECT_TRUE(MonitorQueue::Delete("/q/bad", "fileindex", 1));
    EXPECT_EQ(good, OnlyFile());
  }
  std::filesystem::create_directory(bad);
  EXPECT_FALSE(Upsert("/q/bad", 1)) << "what cannot be read may be right";
  EXPECT_EQ(KOVA_ERR_BAD_CONFIGURATION, KLIBCErrGet());
}

TEST_F(HostRegistryTest, WhatCannotBeWrittenLeavesTheOldRegistration) {
  ASSERT_TRUE(Upsert("/q/a", 1));
  const string lock = RegistryFolder() + ".lock", elsewhere = TestRoot() + "/elsewhere";
  WriteFile(elsewhere, "");
  std::filesystem::remove(lock);
  std::filesystem::create_symlink(elsewhere, lock);
  EXPECT_FALSE(Upsert("/q/a", 2)) << "the lock is a link";
  EXPECT_EQ(KOVA_ERR_SYSTEM, KLIBCErrGet());
  std::filesystem::remove(lock);
  EXPECT_EQ(1U, ReadRegistrations().list.at(0).watches.size());
  EXPECT_FALSE(MonitorQueue::Upsert(MonitorQueue(Document("/q/a", 1)), "a/b", 1)) << "no name of an application";
  EXPECT_FALSE(MonitorQueue::Upsert(MonitorQueue(Document("/q/a", 1)), "", 1));
}

TEST_F(HostRegistryTest, AWriterThatIsKilledLeavesTheOldOrTheNew) {
  ASSERT_TRUE(Upsert("/q/a", 1));
  for (int round = 0; round < 20; ++round) {
    const pid_t child = fork();
    if (child == 0) {
      for (int i = 0;; ++i) (void)Upsert("/q/a", i % 2 == 0 ? 400 : 1);
    }
    (void)usleep(static_cast<useconds_t>(1000 + round * 731));
    ASSERT_EQ(0, kill(child, SIGKILL));
    ASSERT_EQ(child, waitpid(child, nullptr, 0));
    const auto registrations = ReadRegistrations();
    EXPECT_TRUE(registrations.problems.empty());
    ASSERT_EQ(1U, registrations.list.size());
    const size_t watches = registrations.list[0].watches.size();
    EXPECT_TRUE(watches == 400 || watches == 1) << watches;
  }
  EXPECT_TRUE(Upsert("/q/a", 3));
  EXPECT_EQ(3U, ReadRegistrations().list.at(0).watches.size());
}

}  // namespace
}  // namespace ferrox::test
