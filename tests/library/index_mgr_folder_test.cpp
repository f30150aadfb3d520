#include "common/lock_file.h"
#include "tests/library/index_mgr_fixture.h"

namespace ferrox::fileindex {

namespace {

using test::FailureOf;
using test::Parse;

const std::string kStart = "KLIBServiceStart(kovacontentextractd, 1); KLIBServicectlStart(pkg-Ferrox-fileindexd, 1); ";
const std::string kStop =
    "KOVASMBSetSpotlight(0); KLIBServiceRestart(samba); KLIBServiceStop(kovacontentextractd, 0); "
    "KLIBServicectlStop(pkg-Ferrox-fileindexd, 1); ";

std::string Told(const std::string& share, const std::string& is_upsert = "true") {
  return "notify_setting_changed is_upsert:" + is_upsert + ",share_name:" + share + "; ";
}

}  // namespace

TEST_F(IndexMgrTest, AddDoesAllInOrder) {
  Store({Entry("/music", "a")});
  platform_.spotlight = 0;
  const Json::Value list = List({Entry("/photo/a", "p"), Entry("/music/a", "a"), Entry("/photo/a/b")});
  EXPECT_EQ(Effects([&] { FolderAdd(list, false); }),
            "KOVASMBSetSpotlight(1); KLIBServiceRestart(samba); " + kStart +
                "watch(music); index_create fileindex_photo; watch(photo); saved; " + Told("music") + Told("photo") +
                "queue photo: kinds /volume1/photo/a [davp]; queue music: kinds /volume10/music/a [davp]; "
                "queue photo: kinds /volume1/photo/a/b [davp]; ");
  EXPECT_EQ(Stored(), "/music a; /photo/a p; /music/a a; /photo/a/b dp; ");
  const std::string watch = R"({"ignore":["@eaDir"],"mask":65478,"path":")" + platform_.shares["photo"].path;
  EXPECT_EQ((platform_.monitor_queues[{"fileindex", 1, queues_["photo"]}]),
            Parse(R"({"config":[)" + watch + "/a\"}," + watch + R"(/a/b"}],"queue":")" + queues_["photo"] + "\"}"));
}

TEST_F(IndexMgrTest, SetQueuesWhatDiffersAndMakesNoIndex) {
  Store({Entry("/photo", "p")});
  const Json::Value list = List({Entry("/photo"), Entry("/photo/a", "av"), Entry("/photos")});
  EXPECT_EQ(Effects([&] { FolderSet(list, false); }),
            kStart + "watch(photo); watch(photos); saved; " + Told("photo") + Told("photos") +
                "queue photo: kinds /volume1/photo [d]; queue photo: kinds /volume1/photo/a [davp]; "
                "queue photos: kinds /volume1/photos [davp]; ");
  EXPECT_EQ((platform_.monitor_queues[{"fileindex", 1, queues_["photo"]}]["config"].size()), 2U) << "not of photos";
}

TEST_F(IndexMgrTest, TheUpdaterMayStoreAnyPathAndQueuesNothing) {
  platform_.recycle_bins = {platform_.shares["photo"].path + "/#recycle"};
  const Json::Value list = List({Entry("/photo/#recycle/x", "p")});
  EXPECT_EQ(Effects([&] { FolderAdd(list, true); }),
            kStart + "index_create fileindex_photo; watch(photo); saved; " + Told("photo"));
  EXPECT_EQ(FailureOf([&] { FolderAdd(list, true); }), "901 Duplicated ID: /photo/#recycle/x");
  EXPECT_EQ(Effects([] { FolderSet(List({}), false); }), kStart) << "saved unchanged";
}

TEST_F(IndexMgrTest, WhatCannotBeAddedChangesNothing) {
  const std::string photo = platform_.shares["photo"].path;
  for (const char* folder : {"/#snapshot/x", "/#recycle/x"}) fs::create_directories(photo + folder);
  fs::create_directory_symlink(photo + "/a", photo + "/link");
  platform_.snapshots = {photo + "/#snapshot"};
  platform_.recycle_bins = {photo + "/#recycle"};
  AddShare("locked", "/volume1/");
  platform_.shares["locked"].encrypted = 1;
  Store({Entry("/photo/a")});
  Json::Value without_photo = Entry("/photo/a/b");
  without_photo.removeMember("photo");
  std::vector<std::pair<Json::Value, std::string>> rows = {
      {Parse("{}"), "120 "},
      {List({7}), "120 Not an object"},
      {List({without_photo}), "120 Missing property: photo"},
      {List({Entry("photo/a")}), "120 "},
      {List({Entry("/photo"), Entry("/nope/a")}), "800 nope"},
      {List({Entry("/photo"), Entry("/photo/a")}), "901 Duplicated ID: /photo/a"},
      {List({Entry("/photo"), Entry("/photo")}), "901 Duplicated ID: /photo"},
  };
  for (const std::string path : {"/photo/../photo", "/photo//a", "/photo/a/", "/photo/link", "/photo/link/b",
                                 "/photo/#snapshot/x", "/photo/#recycle/x", "/photo/gone", "/locked/a"}) {
    rows.emplace_back(List({Entry("/photo/a/b"), Entry(path)}), "903 Path cannot index: " + path);
  }
  for (const auto& [list, failure] : rows) {
    EXPECT_EQ(Effects([&list = list] { FolderAdd(list, false); }).rfind("throws " + failure, 0), 0U) << failure;
  }
  platform_.failing["KOVAQuotaIsEnough"] = {KOVA_ERR_OUT_OF_SPACE, 1};
  EXPECT_EQ(Effects([] {
              FolderSet(List({Entry("/photo"), Entry("/music")}), false);
            }),
            "throws 1003 Share (music) space not enough");
  for (const char* line : {"(FolderUpsert) Failed [!share.IsSpaceEnough()], reason: Share (music) space not enough",
                           "[create && folder_mgr.HasFolder(folder_new->GetPath())], reason: Duplicated ID: /photo",
                           "[!CanPathBeIndexed(folder_new->GetPath()) && !updater_mode], reason: Path cannot index: ",
                           "[!folder_list.isArray()], reason: {}"}) {
    EXPECT_TRUE(log_.Contains(line)) << line;
  }
  EXPECT_EQ(Stored(), "/photo/a dp; ");
}

TEST_F(IndexMgrTest, AThousandFoldersAndNoMore) {
  std::vector<Json::Value> elements;
  for (int i = 0; i < 1000; ++i) {
    elements.push_back(Entry("/photo/n/" + std::to_string(i)));
    fs::create_directories(platform_.shares["photo"].path + "/n/" + std::to_string(i));
  }
  EXPECT_EQ(Failure([&] { FolderAdd(List(elements), false); }), "");
  const std::string queued = test::ReadFile(queues_["photo"]);
  EXPECT_EQ(std::count(queued.begin(), queued.end(), '\n'), 1000);
  EXPECT_EQ(Failure([] { FolderSet(List({Entry("/photo/n/5", "v"), Entry("/photo")}), false); }), "900 ");
  EXPECT_NE(Stored().find("/photo/n/5 dp; "), std::string::npos);
}

TEST_F(IndexMgrTest, ServicesThatFailStopNothing) {
  platform_.spotlight = 0;
  platform_.failing = {{"KLIBServiceRestart", {0xABC}}, {"KLIBServiceStart", {}}, {"KLIBServicectlStart", {}}};
  EXPECT_NE(Effects([] { FolderAdd(List({Entry("/photo")}), false); }).find("queue photo: "), std::string::npos);
  platform_.spotlight = 0;
  platform_.failing = {{"KOVASMBSetSpotlight", {}}};
  EXPECT_EQ(Effects(&PrepareServices), "KOVASMBSetSpotlight(1); " + kStart);
  Store({});
  platform_.spotlight = 1;
  platform_.failing = {{"KLIBServiceStop", {}}, {"KLIBServicectlStop", {}}};
  EXPECT_EQ(Effects(&PrepareServices), kStop);
  for (const char* line : {"(SetupRelatedServices) KLIBServiceRestart failed: err=[0x0ABC fake_platform.cpp:1]",
                           "(SetupRelatedServices) KOVASMBSetSpotlight failed: err=[0x2A00 fake_platform.cpp:1]",
                           R"((SetupRelatedServices) Failed [0 > KLIBServiceStart("kovacontentextractd", TRUE)])",
                           R"([0 > KLIBServicectlStart("pkg-Ferrox-fileindexd", KLIB_SERVICECTL_UPSTART)])",
                           R"([0 > KLIBServiceStop("kovacontentextractd", FALSE)])",
                           R"([0 > KLIBServicectlStop("pkg-Ferrox-fileindexd", KLIB_SERVICECTL_UPSTART)])"}) {
    EXPECT_TRUE(log_.Contains(line)) << line;
  }
}

TEST_F(IndexMgrTest, WhatWasNotDoneIsSaid) {
  struct Row {
    std::function<void()> fail;
    std::string failure;
    bool saved;
    std::string not_done;
  };
  const std::string told = "tell the index daemon of photo; queue the changes of 1 folders";
  for (const Row& row : {
           Row{[this] { engine_fails_["index_create"] = 1407; }, "1407 Request failed, msg=m", false,
               "create the index of photo; watch the folders of photo; save the folders; " + told},
           Row{[this] { platform_.failing["MonitorQueue::Upsert"] = {}; },
               "502 MonitorQueue::Upsert failed, share=photo", false, "watch the folders of photo; save the folders"},
           Row{[this] { fs::create_directories(folders_ + ".new"); }, "505 " + folders_, false, "save the folders"},
           Row{[this] { daemon_runs_ = false; }, "502 write failed, reason=Transport endpoint is not connected", true,
               told},
           Row{[this] {
                 platform_.failing["FILEIDXQueuePathCompose"] = {KOVA_ERR_SYSTEM, 1};
               },
               "502 FILEIDXQueuePathCompose failed, share=photo", true, "queue the changes of 1 folders"},
       }) {
    SetUp();
    row.fail();
    EXPECT_EQ(Failure([] { FolderAdd(List({Entry("/photo")}), false); }), row.failure);
    EXPECT_EQ(Stored(), row.saved ? "/photo dp; " : "");
    EXPECT_TRUE(log_.Contains("(FolderAdd) Stopped, reason: " + row.failure.substr(row.failure.find(' ') + 1) +
                              ". Not done: " + row.not_done))
        << row.failure;
  }
}

TEST_F(IndexMgrTest, DeleteFollowsWhatIsLeft) {
  Store({Entry("/photo"), Entry("/photo/a", "dpv"), Entry("/music", "a"), Entry("/music/a", "a")});
  test::WriteFile(status_, R"({"share":{"music":3,"photo":1}})");
  EXPECT_EQ(Effects([] {
              FolderDelete(List({"/photo/a", "/music/a", "/music"}));
            }),
            "index_delete fileindex_music; unwatch(music); rm(music); rm(music.tmp); rm(music.index); status photo:1; "
            "watch(photo); saved; " +
                Told("music", "false") + Told("photo", "false") + "queue photo: kinds /volume1/photo/a [v]; ");
  EXPECT_EQ(Stored(), "/photo dp; ");
  engine_fails_["index_delete"] = Error::kEngineNoSuchIndex;  // as an interrupted attempt leaves it
  EXPECT_EQ(
      Effects([] { FolderDelete(List({"/photo"})); }),
      "index_delete fileindex_photo; unwatch(photo); rm(photo); rm(photo.tmp); rm(photo.index); status ; saved; " +
          Told("photo", "false") + kStop);
  EXPECT_EQ(Stored(), "");
}

TEST_F(IndexMgrTest, DeleteIsAllOrNone) {
  Store({Entry("/photo"), Entry("/gone/x"), Entry("odd")});
  for (const auto& [list, failure] : std::vector<std::pair<Json::Value, std::string>>{
           {Parse("\"/photo\""), "120 /photo"},
           {List({"/photo", 5}), "120 5"},
           {List({"/photo", "/photo/a"}), "902 /photo/a"},
           {List({"/photo", "/photo"}), "902 /photo"},
           {List({"/photo/"}), "902 /photo/"},
       }) {
    EXPECT_EQ(Effects([&list = list] { FolderDelete(list); }), "throws " + failure);
  }
  EXPECT_EQ(Effects([] {
              FolderDelete(List({"odd", "/gone/x"}));
            }),
            "index_delete fileindex_gone; status null; saved; " + Told("gone", "false"))
      << "an entry whose share is gone can be deleted";
  EXPECT_EQ(Stored(), "/photo dp; ");
  platform_.failing["KOVAShareGet"] = {};
  EXPECT_EQ(Effects([] { FolderDelete(List({"/photo"})); }), "throws 800 photo") << "a failure is no absence";
}

TEST_F(IndexMgrTest, ChangesWaitForTheLock) {
  Store({Entry("/photo")});
  const LockFile held(InstancePath(kFolderLockPath), true);
  const std::function<void()> changes[] = {[] { FolderAdd(List({Entry("/music")}), false); },
                                           [] { FolderSet(List({Entry("/music")}), true); },
                                           [] { FolderDelete(List({"/photo"})); }};
  for (const auto& change : changes) {
    EXPECT_EQ(FailureOf(change), "506 Exceed max retry, path=" + InstancePath(kFolderLockPath));
  }
  EXPECT_EQ(clock_.sleeps.size(), 3U * 64U);
  EXPECT_EQ(Effects([] { FolderReindex(List({"/photo"})); }), "queue photo: reindex /volume1/photo; ");
}

TEST_F(IndexMgrTest, ReindexOfPathsAndOfShares) {
  Store({Entry("/photo"), Entry("/photos"), Entry("/homes"), Entry("/music")});
  test::WriteFile(status_, R"({"share":{"homes":2,"photo":1,"photos":3}})");
  AddShare("video", "/volume1/");
  const Json::Value list = List({"/photos/a", "/video", "/photo/a", "/photo/a/b", "/homes", "/photo", "/music"});
  EXPECT_EQ(
      Effects([&] { FolderReindex(list); }),
      "queue photo: reindex /volume1/photo/a; queue photo: reindex /volume1/photo; "
      "queue music: reindex /volume10/music; index_delete fileindex_homes; index_create fileindex_homes; "
      "queue homes: reindex /volume1/homes; index_delete fileindex_photos; index_create fileindex_photos; "
      "queue photos: reindex /volume1/photos; status homes:2,photo:0,photos:3; status homes:2,photo:0,photos:0; ");
  EXPECT_EQ(Effects([] { FolderReindex(List({"/music/a", "/photo", 5})); }), "throws 120 5") << "all covered";
  fs::remove(queues_["music"]);
  EXPECT_EQ(Effects([] {
              FolderReindex(List({"/music/a", "music"}));
            }),
            "queue music: reindex /volume10/music/a; throws 120 ");
  EXPECT_EQ(Effects([] { FolderReindex("/photo"); }), "throws 120 /photo");
}

TEST_F(IndexMgrTest, GetAndList) {
  Store({Entry("/photo", "p"), Entry("/gone", "d"), Entry("/music", "a")});
  Json::Value out;
  FolderGet(out, "/music");
  EXPECT_EQ(out, Entry("/music", "a"));
  EXPECT_EQ(FailureOf([&] { FolderGet(out, "/music/"); }), "902 /music/");
  const auto list = [&out](unsigned offset, unsigned limit, const Json::Value& additional) {
    FolderList(out, offset, limit, "path", "desc", additional);
    std::string text;
    for (const Json::Value& folder : out["folder"]) {
      text += folder["path"].asString() + " " + folder["additional"]["status"]["text"].asString() + ";";
    }
    return text + out["total"].asString() + "/" + out["offset"].asString();
  };
  EXPECT_EQ(list(1, 2, List({})), "/music ;/gone ;3/1");
  EXPECT_EQ(list(0, 9, List({"status"})), "/photo finished;/music finished;3/0") << "what cannot be told is left out";
  EXPECT_EQ(list(7, 9, List({"status"})), "3/7");
  EXPECT_TRUE(out["folder"].isArray());
  EXPECT_EQ(list(0, 9, "status"), "3/0");
}

}  // namespace ferrox::fileindex
