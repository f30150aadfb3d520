// What the Linux host keeps of MonitorQueue on disk, and what its reader makes of it.

#include <sys/stat.h>

#include <filesystem>
#include <functional>
#include <set>
#include <string>
#include <vector>

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
      watch["path"] = "/v/" + std::to_string(i);
      watch["mask"] = 65478;
      watch["ignore"].append("@eaDir");
      document["config"].append(watch);
    }
    return document;
  }
  static bool Upsert(const Json::Value& document, const string& application = "fileindex", int type = 1) {
    return MonitorQueue::Upsert(MonitorQueue(document), application, type);
  }
  static bool Upsert(const string& queue, int folders) { return Upsert(Document(queue, folders)); }
  /// "application type queue: folders" of each registration.
  static std::multiset<string> Registered() {
    std::multiset<string> texts;
    for (const kova::host::Registration& registration : ReadRegistrations().list) {
      string text = registration.application + " " + std::to_string(registration.type) + " " + registration.queue + ":";
      for (const kova::host::Watch& watch : registration.watches) {
        text += " " + watch.path;
        EXPECT_EQ(65478U, watch.mask);
        EXPECT_EQ(std::vector<string>{"@eaDir"}, watch.ignore);
      }
      texts.insert(text);
    }
    return texts;
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

TEST_F(HostRegistryTest, AQueueIsRegisteredByItsPathApplicationAndType) {
  const string odd = "/v/q\xff \"\\\n";
  Json::Value document = Document("/v/q", 2);
  document["config"][1]["path"] = odd;
  EXPECT_TRUE(Upsert(document));
  EXPECT_TRUE(Upsert(Document("/v/q", 0), "other"));
  EXPECT_TRUE(Upsert(Document("/v/q", 0), "fileindex", 2));
  EXPECT_TRUE(Upsert(odd, 0));
  EXPECT_EQ((std::multiset<string>{"fileindex 1 /v/q: /v/0 " + odd,
                                   "other 1 /v/q:", "fileindex 2 /v/q:", "fileindex 1 " + odd + ":"}),
            Registered());
  EXPECT_TRUE(Upsert("/v/q", 1)) << "in place of the first";
  EXPECT_TRUE(MonitorQueue::Delete("/v/q", "other", 1));
  EXPECT_TRUE(MonitorQueue::Delete("/v/q", "other", 1)) << "there is none any more";
  EXPECT_TRUE(MonitorQueue::Delete("/v/q", "fileindex", 2));
  EXPECT_TRUE(MonitorQueue::Delete(odd, "fileindex", 1));
  EXPECT_EQ(std::multiset<string>{"fileindex 1 /v/q: /v/0"}, Registered());
}

TEST_F(HostRegistryTest, ABadRegistrationIsRefusedWholeAndChangesNothing) {
  ASSERT_TRUE(Upsert("/v/q", 1));
  const std::function<void(Json::Value&)> damages[] = {
      [](Json::Value& d) { d = Json::nullValue; },
      [](Json::Value& d) { d = Json::arrayValue; },
      [](Json::Value& d) { d["queue"] = "v/q"; },
      [](Json::Value& d) { d.removeMember("queue"); },
      [](Json::Value& d) { d["config"] = Json::nullValue; },
      [](Json::Value& d) { d["config"][1] = "/v/d"; },
      [](Json::Value& d) { d["config"][1]["path"] = "v/d"; },
      [](Json::Value& d) { d["config"][1]["path"] = string("/v/d\0e", 6); },
      [](Json::Value& d) { d["config"][1]["mask"] = -1; },
      [](Json::Value& d) { d["config"][1].removeMember("ignore"); },
      [](Json::Value& d) { d["config"][1]["ignore"] = "@eaDir"; },
      [](Json::Value& d) { d["config"][1]["ignore"].append("a/b"); },
      [](Json::Value& d) { d["config"][1]["ignore"].append(".."); },
  };
  for (const auto& damage : damages) {
    Json::Value document = Document("/v/q", 2);
    damage(document);
    EXPECT_FALSE(Upsert(document)) << document.toStyledString();
    EXPECT_EQ(KOVA_ERR_BAD_PARAMETER, KLIBCErrGet());
    EXPECT_EQ(std::multiset<string>{"fileindex 1 /v/q: /v/0"}, Registered());
  }
}

TEST_F(HostRegistryTest, OnlyAChangeIsWritten) {
  EXPECT_TRUE(ReadRegistrations().problems.empty()) << "there is no folder yet";
  ASSERT_TRUE(Upsert("/q/a", 2));
  const string file = OnlyFile();
  const ino_t first = Inode(file);
  ASSERT_TRUE(Upsert("/q/a", 2));
  EXPECT_EQ(first, Inode(file));
  ASSERT_TRUE(Upsert("/q/a", 3));
  EXPECT_NE(first, Inode(file)) << "a writer that is killed must leave the old one or the new one";
  WriteFile(file + ".Xy12ab", "half of somethi");
  EXPECT_EQ(1U, ReadRegistrations().list.size());
  EXPECT_TRUE(ReadRegistrations().problems.empty()) << "what a killed writer leaves is no registration";
}

TEST_F(HostRegistryTest, ADamagedFileIsNamedAndKept) {
  ASSERT_TRUE(Upsert("/q/good", 1));
  const string good = OnlyFile();
  ASSERT_TRUE(Upsert("/q/bad", 1));
  string bad;
  for (const auto& entry : std::filesystem::directory_iterator(RegistryFolder())) {
    if (entry.path() != good) bad = entry.path();
  }
  for (const string& damage : {string(), string("null"), string("{\"queue\":\"/q/bad\",\"conf"), string(1000, '\0'),
                               ReadFile(good), string(3000, '[')}) {
    WriteFile(bad, damage);
    log_.lines.clear();
    EXPECT_FALSE(Upsert("/q/bad", 1));
    EXPECT_EQ(KOVA_ERR_BAD_CONFIGURATION, KLIBCErrGet());
    EXPECT_FALSE(MonitorQueue::Delete("/q/bad", "fileindex", 1));
    EXPECT_EQ(damage, ReadFile(bad));
    ASSERT_EQ(2U, log_.lines.size());
    EXPECT_NE(string::npos, log_.lines[0].find(bad)) << log_.lines[0];
    EXPECT_NE(string::npos, log_.lines[0].find("move it away")) << log_.lines[0];
    const auto registrations = ReadRegistrations();
    ASSERT_EQ(1U, registrations.list.size()) << "the others are used all the same";
    EXPECT_EQ("/q/good", registrations.list[0].queue);
    EXPECT_EQ(log_.lines[0], registrations.problems.at(0));
  }
  std::filesystem::remove(bad);
  EXPECT_TRUE(Upsert("/q/bad", 1));
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
  EXPECT_FALSE(Upsert(Document("/q/a", 1), "a/b")) << "no name of an application";
  EXPECT_FALSE(Upsert(Document("/q/a", 1), ""));
}

}  // namespace
}  // namespace ferrox::test
