// Catches changes of folders whose steps differ, come in another order, or are not told when one fails.
#include <sys/wait.h>

#include <csignal>

#include "common/lock_file.h"
#include "fileindex/operations/operation_error.h"
#include "tests/library/index_mgr_fixture.h"

namespace ferrox::fileindex {

namespace {

using test::Parse;

const std::string kStart = "KLIBServiceStart(kovacontentextractd, 1); KLIBServicectlStart(pkg-Ferrox-fileindexd, 1); ";
const std::string kStop = "KLIBServiceStop(kovacontentextractd, 0); KLIBServicectlStop(pkg-Ferrox-fileindexd, 1); ";

std::string Told(const std::string& share, const std::string& is_upsert = "true") {
  return "notify_setting_changed is_upsert:" + is_upsert + ",share_name:" + share + "; ";
}

}  // namespace

TEST_F(IndexMgrTest, AddDoesAllInOrder) {
  Store("/music a");
  platform_.spotlight = 0;
  EXPECT_EQ(Does(&FolderAdd, Folders("/photo/a p; /music/a a; /photo/a/b"), false),
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
  Store("/photo p");
  EXPECT_EQ(Does(&FolderSet, Folders("/photo; /photo/a av; /photos"), false),
            kStart + "watch(photo); watch(photos); saved; " + Told("photo") + Told("photos") +
                "queue photo: kinds /volume1/photo [d]; queue photo: kinds /volume1/photo/a [davp]; "
                "queue photos: kinds /volume1/photos [davp]; ");
  EXPECT_EQ((platform_.monitor_queues[{"fileindex", 1, queues_["photo"]}]["config"].size()), 2U) << "not of photos";
  EXPECT_EQ(Does(&FolderSet, Json::Value(), false), kStart) << "saved unchanged";
}

TEST_F(IndexMgrTest, TheUpdaterMayStoreAnyPathAndQueuesNothing) {
  platform_.recycle_bins = {platform_.shares["photo"].path + "/#recycle"};
  const Json::Value list = Folders("/photo/#recycle/x p");
  EXPECT_EQ(Does(&FolderAdd, list, true),
            kStart + "index_create fileindex_photo; watch(photo); saved; " + Told("photo"));
  EXPECT_EQ(Does(&FolderAdd, list, true), "throws 901 Duplicated ID: /photo/#recycle/x");
}

TEST_F(IndexMgrTest, WhatCannotBeAddedChangesNothing) {
  const std::string photo = platform_.shares["photo"].path;
  for (const char* folder : {"/#snapshot/x", "/#recycle/x"}) fs::create_directories(photo + folder);
  fs::create_directory_symlink(photo + "/a", photo + "/link");
  platform_.snapshots = {photo + "/#snapshot"};
  platform_.recycle_bins = {photo + "/#recycle"};
  platform_.shares["homes"].encrypted = 1;
  Store("/photo/a");
  Json::Value without_photo = Folders("/photo/a/b");
  without_photo[0].removeMember("photo");
  std::vector<std::pair<Json::Value, std::string>> rows = {
      {Parse("{}"), "120 "},
      {List({7}), "120 Not an object"},
      {without_photo, "120 Missing property: photo"},
      {Folders("photo/a"), "120 "},
      {Folders("/photo; /nope/a"), "800 nope"},
      {Folders("/photo; /photo/a"), "901 Duplicated ID: /photo/a"},
      {Folders("/photo; /photo"), "901 Duplicated ID: /photo"},
  };
  for (const std::string path : {"/photo/../photo", "/photo//a", "/photo/a/", "/photo/link", "/photo/link/b",
                                 "/photo/#snapshot/x", "/photo/#recycle/x", "/photo/gone", "/homes/a"}) {
    rows.emplace_back(Folders("/photo/a/b; " + path), "903 Path cannot index: " + path);
  }
  for (const auto& [list, failure] : rows) {
    EXPECT_EQ(Does(&FolderAdd, list, false).rfind("throws " + failure, 0), 0U) << failure;
  }
  platform_.failing["KOVAQuotaIsEnough"] = {KOVA_ERR_OUT_OF_SPACE, 1};
  EXPECT_EQ(Does(&FolderSet, Folders("/photo; /music"), false), "throws 1003 Share (music) space not enough");
  EXPECT_EQ(Stored(), "/photo/a dp; ");
}

TEST_F(IndexMgrTest, ServicesThatFailStopNothing) {
  platform_.spotlight = 0;
  platform_.failing = {{"KLIBServiceRestart", {0xABC}}, {"KLIBServiceStart", {}}, {"KLIBServicectlStart", {}}};
  EXPECT_NE(Does(&FolderAdd, Folders("/photo"), false).find("queue photo: "), std::string::npos);
  platform_.spotlight = 0;
  platform_.failing = {{"KOVASMBSetSpotlight", {}}, {"KLIBServiceStop", {}}, {"KLIBServicectlStop", {}}};
  EXPECT_EQ(Does(&PrepareServices), "KOVASMBSetSpotlight(1); " + kStart);
  Store("");
  EXPECT_EQ(Does(&PrepareServices), kStop);
  for (const char* line : {"KLIBServiceRestart failed: err=[0x0ABC fake_platform.cpp:1]",
                           "KOVASMBSetSpotlight failed: err=[0x2A00 fake_platform.cpp:1]"}) {
    EXPECT_TRUE(log_.Contains(line)) << line;
  }
}

TEST_F(IndexMgrTest, WhatWasNotDoneIsSaid) {
  const auto check = [this](const std::string& failure, const std::string& stored, const std::string& not_done,
                            Subject::Kind cause, Subject::Kind step) {
    EXPECT_EQ(Failure([&] {
                try {
                  FolderAdd(Folders("/photo"), false);
                } catch (const OperationError& error) {
                  EXPECT_EQ(error.NotDoneText().substr(0, not_done.size()), not_done);
                  EXPECT_EQ(error.About().kind, cause) << failure;
                  EXPECT_EQ(error.NotDone().front().about.kind, step) << failure;
                  throw;
                }
              }),
              failure);
    EXPECT_EQ(Stored(), stored);
    EXPECT_TRUE(log_.Contains(failure.substr(failure.find(' ') + 1) + ". Not done: " + not_done)) << failure;
    SetUp();
  };
  engine_fails_["index_create"] = 1407;
  check("1407 Request failed, msg=m", "", "create the index of photo; watch the folders of photo; save the folders",
        Subject::kEngineRefusal, Subject::kShare);
  platform_.failing["MonitorQueue::Upsert"] = {};
  check("502 MonitorQueue::Upsert failed, share=photo", "", "watch the folders of photo; save the folders; tell the",
        Subject::kWatching, Subject::kShare);
  fs::create_directories(folders_ + ".new");
  check("505 " + folders_, "", "save the folders; tell the index daemon of photo; queue the changes of 1 folders",
        Subject::kFile, Subject::kFolders);
  daemon_runs_ = false;
  check("502 write failed, reason=Transport endpoint is not connected", "/photo dp; ",
        "tell the index daemon of photo; queue the changes of 1 folders", Subject::kDaemonChannel, Subject::kShare);
}

TEST_F(IndexMgrTest, DeleteFollowsWhatIsLeft) {
  Store("/photo; /photo/a dpv; /music a; /music/a a");
  test::WriteFile(status_, R"({"share":{"music":3,"photo":1}})");
  EXPECT_EQ(Does(&FolderDelete, List({"/photo/a", "/music/a", "/music"})),
            "index_delete fileindex_music; unwatch(music); rm(music); rm(music.tmp); rm(music.index); status photo:1; "
            "watch(photo); saved; " +
                Told("music", "false") + Told("photo", "false") + "queue photo: kinds /volume1/photo/a [v]; ");
  EXPECT_EQ(Stored(), "/photo dp; ");
  engine_fails_["index_delete"] = Error::kEngineNoSuchIndex;  // as an interrupted attempt leaves it
  EXPECT_EQ(
      Does(&FolderDelete, List({"/photo"})),
      "index_delete fileindex_photo; unwatch(photo); rm(photo); rm(photo.tmp); rm(photo.index); status ; saved; " +
          Told("photo", "false") + "KOVASMBSetSpotlight(0); KLIBServiceRestart(samba); " + kStop);
}

TEST_F(IndexMgrTest, DeleteIsAllOrNone) {
  Store("/photo; /gone/x; odd");
  EXPECT_EQ(Does(&FolderDelete, "/photo"), "throws 120 /photo");
  EXPECT_EQ(Does(&FolderDelete, List({"/photo", 5})), "throws 120 5");
  EXPECT_EQ(Does(&FolderDelete, List({"/photo", "/photo"})), "throws 902 /photo");
  EXPECT_EQ(Does(&FolderDelete, List({"/photo", "/photo/"})), "throws 902 /photo/");
  EXPECT_EQ(Does(&FolderDelete, List({"odd", "/gone/x"})),
            "index_delete fileindex_gone; status null; saved; " + Told("gone", "false"))
      << "an entry whose share is gone can be deleted";
  EXPECT_EQ(Stored(), "/photo dp; ");
  platform_.failing["KOVAShareGet"] = {KOVA_ERR_SYSTEM, 1};
  EXPECT_EQ(Does(&FolderDelete, List({"/photo"})), "throws 800 photo") << "a failure is no absence";
}

TEST_F(IndexMgrTest, ChangesWaitForTheLock) {
  Store("/photo");
  const LockFile held(InstancePath(kFolderLockPath), true);
  const std::string locked = "throws 506 Exceed max retry, path=/tmp/ferrox_cfg_folder.lock";
  EXPECT_EQ(Does(&FolderAdd, List({}), false), locked);
  EXPECT_EQ(Does(&FolderSet, List({}), true), locked);
  EXPECT_EQ(Does(&FolderDelete, List({})), locked);
  EXPECT_EQ(clock_.sleeps.size(), 3U * 64U);
  EXPECT_EQ(Does(&FolderReindex, List({"/photo"})), "queue photo: reindex /volume1/photo; ");
}

TEST_F(IndexMgrTest, ReindexOfPathsAndOfShares) {
  Store("/photo; /photos; /homes; /music");
  test::WriteFile(status_, R"({"share":{"homes":2,"photo":1,"photos":3}})");
  EXPECT_EQ(
      Does(&FolderReindex, List({"/photos/a", "/nope", "/photo/a", "/photo/a/b", "/homes", "/photo", "/music"})),
      "queue photo: reindex /volume1/photo/a; queue photo: reindex /volume1/photo; "
      "queue music: reindex /volume10/music; index_delete fileindex_homes; index_create fileindex_homes; "
      "queue homes: reindex /volume1/homes; index_delete fileindex_photos; index_create fileindex_photos; "
      "queue photos: reindex /volume1/photos; status homes:2,photo:0,photos:3; status homes:2,photo:0,photos:0; ");
  fs::remove(queues_["music"]);
  EXPECT_EQ(Does(&FolderReindex, List({"/photo/a", "/music/a", 5})),
            "queue music: reindex /volume10/music/a; throws 120 5");
  EXPECT_EQ(Does(&FolderReindex, List({"photo"})), "throws 120 ");
  EXPECT_EQ(Does(&FolderReindex, "/photo"), "throws 120 /photo");
}

TEST_F(IndexMgrTest, KilledAtAnyMomentTheFoldersAreTheOldOrTheNew) {
  daemon_runs_ = false;
  Store("/photo/a");
  std::map<std::string, int> left;
  for (useconds_t round = 0; left["/photo/a dp; "] < 20 || left["/photo/a dp; /photo p; "] < 20; ++round) {
    const pid_t child = fork();
    while (child == 0) {
      (void)Failure([] { FolderSet(Folders("/photo p"), false); });
      (void)Failure([] { FolderDelete(List({"/photo"})); });
    }
    (void)usleep(1000 + 131 * (round % 60) * (1 + round / 60));  // longer and longer: the machine may be slow
    (void)kill(child, SIGKILL);
    (void)waitpid(child, nullptr, 0);
    ++left[Stored()];
    ASSERT_LE(left.size(), 2U) << Stored();
  }
}

TEST_F(IndexMgrTest, GetAndList) {
  Store("/photo p; /gone d; /music a");
  Json::Value out;
  FolderGet(out, "/music");
  EXPECT_EQ(out, Folders("/music a")[0]);
  EXPECT_EQ(Does([&out] { FolderGet(out, "/music/"); }), "throws 902 /music/");
  FolderList(out, 7, 9, "path", "", List({}));
  EXPECT_EQ(toString(out), R"({"folder":[],"offset":7,"total":3})");
  FolderList(out, 0, 9, "path", "", List({"status"}));
  EXPECT_EQ(out["folder"].size(), 2U) << "what cannot be told is left out";
  EXPECT_EQ(out["folder"][1]["additional"]["status"]["text"], "finished");
}

}  // namespace ferrox::fileindex
