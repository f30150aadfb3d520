// Catches stored folders that are read differently, and a status that depends on what else was asked.
#include "fileindex/folders/folder.h"

#include <array>
#include <random>

#include "common/new_class.h"
#include "fileindex/folders/folder_mgr.h"
#include "fileindex/folders/folder_status.h"
#include "fileindex/status_mgr.h"
#include "fileindex/util.h"
#include "sdk/share.h"
#include "tests/support/library_test.h"
#include "tests/support/queue_lines.h"

namespace ferrox::fileindex {

namespace {

namespace fs = std::filesystem;
using test::FailureOf;
using test::Parse;
using FolderPtr = std::shared_ptr<Folder>;

FolderPtr NewFolder(const std::string& path) {
  return newClass<Folder>(path, "n", true, true, true, true, false, false);
}

class FolderTest : public test::LibraryTest {
 protected:
  /// Two shares with folders that are there.
  void SetUp() override {
    fs::remove(InstancePath(kFileIndexFoldersCfgPath));
    fs::remove(InstancePath(kFileIndexStatusCfgPath));
    for (const char* share : {"photo", "music"}) {
      platform_.shares[share].path = volume_ / share;
      for (const char* folder : {"/a/b", "/ab", "/c"}) fs::create_directories(volume_ / (share + std::string(folder)));
      queue_[share] = sdk::SDKShare(share).GetQueuePath();
      fs::remove(queue_[share]);
      fs::remove(queue_[share] + ".tmp");
    }
  }
  /// What the folder is told: its status, or the failure.
  static std::string Told(FolderStatus& status, const Folder& folder) {
    Json::Value out;
    const std::string failure = FailureOf([&] { status.GetStatus(out, folder); });
    return failure.empty() ? out["text"].asString() + out["desc"].asString() : failure;
  }
  static std::string Told(const std::string& path) {
    const FolderPtr folder = NewFolder(path);
    FolderStatus status(*folder);
    return Told(status, *folder);
  }

  const test::TempDir volume_;
  std::map<std::string, std::string> queue_;
};

}  // namespace

TEST_F(FolderTest, StoredFormsAreReadAndWritten) {
  const std::string kinds = R"({"audio":true,"document":false,"photo":true,"video":false)";
  const std::string least = kinds + R"(,"name":"n","path":"/photo/a")";
  const std::string full = least + R"(,"paused":true,"privileged":true,"volume_to_be_clean":"/volume2"})";
  const Json::Value defaults = Parse(least + R"(,"paused":false,"privileged":false,"volume_to_be_clean":""})");
  EXPECT_EQ(Folder(Parse(full)).GetData(), Parse(full));
  EXPECT_EQ(Folder(Parse(full)).GetIndexCfg(), Parse(kinds + "}"));
  EXPECT_EQ(Folder(Parse(least + "}")).GetData(), defaults);
  EXPECT_EQ(Folder(Parse(least + R"(,"paused":"x","privileged":[],"volume_to_be_clean":{}})")).GetData(), defaults);
}

TEST_F(FolderTest, TheFirstUnusableMemberIsNamed) {
  Json::Value data(Json::objectValue);
  for (const char* key : {"path", "name", "document", "audio", "video", "photo"}) {
    EXPECT_EQ(FailureOf([&data] { Folder{data}; }).find(std::string("120 Missing property: ") + key + ","), 0U) << key;
    data[key] = Json::Value(Json::arrayValue);
    EXPECT_EQ(FailureOf([&data] { Folder{data}; }).find("120 Not a string,"), 0U) << key;
    data[key] = true;
  }
}

TEST_F(FolderTest, FollowsItsShare) {
  platform_.shares["photo"].path = "/volume1/photo";
  platform_.shares["new"].path = "/volume2/new";
  Folder folder = *NewFolder("/photo/a/photo");
  EXPECT_EQ(folder.GetShare() + " " + folder.GetFullPath(), "photo /volume1/photo/a/photo");
  folder.SetShare("new");
  EXPECT_EQ(folder.GetShare() + " " + folder.GetPath(), "new /new/a/photo");
  EXPECT_EQ(folder.GetFullPath(), "/volume1/photo/a/photo") << "deliberate: as it was asked for before";
  folder.SetPath("/new/b");
  EXPECT_EQ(folder.GetFullPath(), "/volume2/new/b");
  folder.SetPath("new");
  EXPECT_EQ(FailureOf([&folder] { (void)folder.GetFullPath(); }), "120 ");
  EXPECT_EQ(FailureOf([&folder] { folder.SetShare("photo"); }), "120 ");
  folder.SetPath("/gone");
  EXPECT_EQ(FailureOf([&folder] { (void)folder.GetFullPath(); }), "800 gone");
}

TEST_F(FolderTest, StatusFollowsTheOrderOfItsQuestions) {
  EXPECT_EQ(Told("/photo/a"), "finished");
  test::WriteQueue(queue_["photo"], {test::Create(volume_ / "photo/a/x")});
  EXPECT_TRUE(NewFolder("/photo/a")->IsIndexing());
  for (const auto& [status, text] : {std::pair{"{}", "processing"},
                                     {R"({"resume_time":-1})", "processing"},
                                     {R"({"resume_time":0})", "paused"},
                                     {R"({"resume_time":1700000001})", "paused"},
                                     {R"({"resume_time":1700000000})", "processing"},
                                     {R"({"share":{"photo":3}})", "need_reindex"},
                                     {R"({"share":{"photo":2,"music":1}})", "processing"}}) {
    test::WriteFile(InstancePath(kFileIndexStatusCfgPath), status);
    EXPECT_EQ(Told("/photo/a"), text) << status;
  }
  test::WriteFile(InstancePath(kFileIndexFoldersCfgPath), "{");
  EXPECT_EQ(Told("/photo/a").substr(0, 3), "504") << "the queue is read with the folders at hand";
  test::WriteFile(InstancePath(kFileIndexStatusCfgPath), R"({"share":{"photo":1}})");
  EXPECT_EQ(Told("/photo/a"), "need_reindex");
  EXPECT_EQ(Told("/photo/../photo/a"), "errorinvalid_path");
  EXPECT_EQ(Told("/gone/a"), "800 gone");
  EXPECT_EQ(Told("photo"), "120 ");
  test::WriteFile(InstancePath(kFileIndexStatusCfgPath), "[");
  EXPECT_EQ(Told("photo").substr(0, 3), "504");
}

TEST_F(FolderTest, AdditionalBlocksAreAskedForByName) {
  const FolderPtr folder = NewFolder("/photo/a");
  Json::Value expected = folder->GetData();
  EXPECT_EQ(folder->GetDataWithAdditional(Parse("[]")), expected);
  expected["additional"]["status"]["text"] = "finished";
  EXPECT_EQ(folder->GetDataWithAdditional(Parse(R"(["status","status"])")), expected);
  for (const auto& [additionals, failure] : {std::pair{R"({"a":1})", R"(120 {"a":1})"},
                                             {R"(["status",7])", "120 7"},
                                             {R"(["size"])", "120 Unknown additioal: size"}}) {
    EXPECT_EQ(FailureOf([&, list = additionals] { (void)folder->GetDataWithAdditional(Parse(list)); }), failure);
  }
}

// Each folder of a listing is told what it would be told alone, whatever is wrong with the others.
TEST_F(FolderTest, ManyAreToldWhatOneIsTold) {
  std::vector<FolderPtr> folders;
  for (const char* path : {"/photo", "/photo/a", "/photo/a/b", "/photo/ab", "/photo/a", "/photo/none", "/music/a",
                           "/music/a/b", "/music/c", "/gone/a", "/gone/b", "gone"}) {
    folders.push_back(NewFolder(path));
  }
  const unsigned seed = std::random_device{}();
  SCOPED_TRACE(seed);
  std::mt19937 random(seed);
  const auto place = [&] {
    return volume_ /
           std::array{"photo", "photo/x", "photo/a", "photo/a/b/x", "photo/abc", "photo/ab", "music/c"}[random() % 7];
  };
  const auto queue = [&] {
    std::vector<std::string> lines(random() % 10);
    for (std::string& line : lines) {
      const unsigned dice = random() % 20;
      line = dice == 0 ? "bad" : dice == 1 ? "{}" : dice < 5 ? test::Rename(place(), place()) : test::Create(place());
    }
    return lines;
  };
  for (int round = 0; round < 40; ++round) {
    for (const char* share : {"photo", "music"}) {
      test::WriteQueue(queue_[share], queue());
      test::WriteQueue(queue_[share] + ".tmp", queue());
    }
    platform_.calls.clear();
    FolderStatus together(folders);
    std::vector<std::string> told;
    for (const FolderPtr& folder : folders) told.push_back(Told(together, *folder));
    EXPECT_EQ(platform_.CallCount("FILEIDXQueuePathCompose"), 2) << "one queue for each share";
    for (size_t i = 0; i < folders.size(); ++i) {
      SCOPED_TRACE(folders[i]->GetPath());
      EXPECT_EQ(told[i], Told(folders[i]->GetPath()));
      bool indexing = false;
      const std::string failure = FailureOf([&] { indexing = folders[i]->IsIndexing(); });
      if (told[i] != "errorinvalid_path") {
        EXPECT_EQ(told[i], !failure.empty() ? failure : indexing ? "processing" : "finished");
      }
    }
  }
}

TEST_F(FolderTest, WhatConcernsManyIsLoggedOnce) {
  std::vector<FolderPtr> folders;
  for (int i = 0; i < 20; ++i) folders.push_back(NewFolder(i % 2 == 0 ? "/photo/a" : "/gone/" + std::to_string(i)));
  test::WriteQueue(queue_["photo"], {"bad"});
  FolderStatus status(folders);
  for (const FolderPtr& folder : folders) (void)Told(status, *folder);
  EXPECT_EQ(log_.Lines().size(), 2U) << "the bad line and the share that is gone";
}

}  // namespace ferrox::fileindex
