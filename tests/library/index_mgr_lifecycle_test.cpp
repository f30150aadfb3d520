#include "tests/library/index_mgr_fixture.h"

namespace ferrox::fileindex {

namespace {

std::string Paused(const std::string& share) {
  return "worker_delete share_name:" + share + "; unwatch(" + share + "); index_pause fileindex_" + share + "; ";
}

}  // namespace

TEST_F(IndexMgrTest, MissingArguments) {
  const std::function<void()> calls[] = {
      [] { ShareRename("", ""); },       [] { ShareRename("a", ""); },       [] { ShareMigrate("", "", ""); },
      [] { ShareMigrate("a", "", ""); }, [] { ShareMigrate("a", "b", ""); }, [] { SharePause(""); },
      [] { ShareResume(""); },           [] { ShareClearPaused("", ""); },   [] { ShareClearPaused("a", ""); },
      [] { VolumePause(""); },           [] { VolumeResume(""); },           [] { VolumeClearPaused(""); },
      [] { UserRename("", ""); },        [] { UserRename("a", ""); }};
  std::string failures;
  for (const auto& call : calls) failures += Effects(call);
  std::string expected;
  for (const char* what :
       {"share_from", "share_to", "share_name", "path_from", "path_to", "share name", "share name", "share name",
        "share path", "mount point", "mount point", "mount point", "user_from", "user_to"}) {
    expected += std::string("throws 120 Missing ") + what;
  }
  EXPECT_EQ(failures, expected);
  EXPECT_TRUE(log_.Contains("(ShareRename) Failed [share_to.empty()], reason: Missing share_to"));
}

TEST_F(IndexMgrTest, RenameOfAShare) {
  Store({Entry("/old/old/a", "p"), Entry("/older"), Entry("odd"), Entry("/old")});
  EXPECT_EQ(Effects([] { ShareRename("old", "photo"); }),
            "saved; index_config_set fileindex_old id:fileindex_photo,path:photo.index; "
            "queue photo: rename /volume1/old -> /volume1/photo; ");
  EXPECT_EQ(Stored(), "/photo/old/a p; /older dp; odd dp; /photo dp; ");
  EXPECT_EQ(Effects([] { ShareRename("photo", "photo"); }),
            "index_config_set fileindex_photo id:fileindex_photo,path:photo.index; "
            "queue photo: rename /volume1/photo -> /volume1/photo; ");
  AddShare("volume1", "/volume1/");
  EXPECT_EQ(Effects([] { ShareRename("x", "volume1"); }),
            "index_config_set fileindex_x id:fileindex_volume1,path:volume1.index; "
            "queue volume1: rename /volume1/x -> /volume1/volume1; ")
      << "a folder above the share has its name";
  EXPECT_EQ(Effects([] { ShareRename("older", "nope"); }), "saved; throws 800 nope");
  EXPECT_TRUE(log_.Contains("Not done: rename the index of older; queue the rename of older"));
}

TEST_F(IndexMgrTest, MoveOfAShare) {
  Store({Entry("/photo")});
  const std::string photo = platform_.shares["photo"].path;
  EXPECT_EQ(
      Effects([&] { ShareMigrate("photo", "/volume7/photo", photo); }),
      "index_config_set fileindex_photo path:photo.index; queue photo: rename /volume7/photo -> /volume1/photo; ");
  EXPECT_EQ(Effects([&] { ShareMigrate("photos", "/volume7/photos", photo); }), "") << "has no folders";
}

TEST_F(IndexMgrTest, PauseAndResumeOfAShare) {
  Store({Entry("/photo/a"), Entry("/photos"), Entry("/photo")});
  EXPECT_EQ(Effects([] { SharePause("photo"); }), Paused("photo") + "saved; ");
  EXPECT_EQ(Stored(), "/photo/a dp paused; /photos dp; /photo dp paused; ");
  EXPECT_EQ(Effects([] { ShareResume("photo"); }),
            "index_resume fileindex_photo; watch(photo); worker_create share_name:photo; saved; ");
  EXPECT_EQ(Stored(), "/photo/a dp; /photos dp; /photo dp; ");
  EXPECT_EQ(Effects([] { SharePause("homes"); }) + Effects([] { ShareResume("homes"); }), "") << "has no folders";
  engine_fails_["index_pause"] = 1407;
  EXPECT_EQ(Effects([] { SharePause("photo"); }), Paused("photo") + "throws 1407 Request failed, msg=m");
  EXPECT_EQ(Stored(), "/photo/a dp; /photos dp; /photo dp; ");
  platform_.failing["MonitorQueue::Delete"] = {};
  EXPECT_EQ(Effects([] { SharePause("photo"); }),
            "worker_delete share_name:photo; unwatch(photo); throws 502 MonitorQueue::Delete failed, share=photo");
}

TEST_F(IndexMgrTest, AVolumeIsNotItsNamesake) {
  Store({Entry("/photo/a"), Entry("/music"), Entry("/photo"), Entry("/homes"), Entry("/gone")});
  const std::string volume = test::TestRoot() + "/volume1";
  EXPECT_EQ(Effects([&] { VolumePause(volume); }), "saved; " + Paused("homes") + Paused("photo"));
  EXPECT_EQ(Stored(),
            "/photo/a dp paused /volume1; /music dp; /photo dp paused /volume1; /homes dp paused /volume1; "
            "/gone dp; ");
  EXPECT_EQ(Failure([] { SharePause("music"); }), "");
  EXPECT_EQ(Failure([] { ShareResume("homes"); }), "");
  EXPECT_EQ(Effects([&] { VolumeResume(volume); }),
            "saved; index_resume fileindex_photo; worker_create share_name:photo; watch(photo); ");
  EXPECT_EQ(Stored(), "/photo/a dp /volume1; /music dp paused; /photo dp /volume1; /homes dp /volume1; /gone dp; ");
  EXPECT_EQ(Effects([&] { VolumeResume(volume + "0"); }),
            "saved; index_resume fileindex_music; worker_create share_name:music; watch(music); ");
}

TEST_F(IndexMgrTest, WhatWillNotComeBackIsForgotten) {
  Store({Entry("/photo/a"), Entry("/photos"), Entry("/photo")});
  test::WriteFile(status_, R"({"share":{"homes":2,"photo":1,"photos":3}})");
  const std::string volume = test::TestRoot() + "/volume1";
  EXPECT_EQ(Failure([&] { VolumePause(volume); }), "");
  EXPECT_EQ(Failure([] { ShareResume("photos"); }), "");
  EXPECT_EQ(Effects([&] { VolumeClearPaused(volume + "0"); }), "");
  EXPECT_EQ(Effects([&] { VolumeClearPaused(volume); }), "status homes:2,photos:3; saved; ");
  EXPECT_EQ(Stored(), "/photos dp /volume1; ");
  EXPECT_EQ(Effects([this] { ShareClearPaused("photos", platform_.shares["photos"].path); }),
            "rm(photos); rm(photos.tmp); rm(photos.index); status homes:2; index_delete fileindex_photos; saved; "
            "KOVASMBSetSpotlight(0); KLIBServiceRestart(samba); KLIBServiceStop(kovacontentextractd, 0); "
            "KLIBServicectlStop(pkg-Ferrox-fileindexd, 1); ");
  platform_.failing = {{"FILEIDXDBPathCompose", {}}};
  EXPECT_EQ(Effects([this] { ShareClearPaused("photo", platform_.shares["photo"].path); }),
            "rm(photo); rm(photo.tmp); throws 502 FILEIDXDBPathCompose failed, share_path=/volume1/photo");
  EXPECT_EQ(Effects([] { ShareClearPaused("photo", "/"); }), "throws 502 FILEIDXQueuePathCompose failed, share_path=/");
}

TEST_F(IndexMgrTest, RecycleBins) {
  EXPECT_EQ(Effects([] { ShareCheckRecycle("photo"); }), "queue photo: reindex /volume1/photo/#recycle; ");
  AddShare("linked", "/volume1/");
  fs::remove_all(platform_.shares["linked"].path);
  fs::create_directory_symlink(platform_.shares["photo"].path, platform_.shares["linked"].path);
  EXPECT_EQ(Effects([] { ShareCheckRecycle("linked"); }), "");
  EXPECT_EQ(Effects([] { ShareCheckRecycle("nope"); }), "throws 800 nope");

  const std::string homes = platform_.shares["homes"].path;
  platform_.home_recycle_paths = {{homes + "/ann/#recycle", AUTH_LOCAL}, {homes + "/bob/#recycle", AUTH_LDAP}};
  EXPECT_EQ(Effects([] { HomeEnable(AUTH_LDAP); }), "queue homes: reindex /volume1/homes/bob/#recycle; ");
  EXPECT_EQ(Effects([] { HomeDisable(AUTH_LDAP); }), "queue homes: reindex /volume1/homes/ann/#recycle; ");
  platform_.home_recycle_paths = {{"", AUTH_LDAP}, {"/elsewhere", AUTH_LDAP}, {homes + "/z/#recycle", AUTH_LDAP}};
  EXPECT_EQ(Effects([] { HomeDisable(AUTH_LDAP); }), "status :1; ") << "ends at the first failure";
  platform_.failing = {{"KOVARecycleHomeEnumRecyclePathForAuthType", {}}, {"KOVARecycleHomeEnumRecyclePath", {}}};
  EXPECT_EQ(Effects([] { HomeEnable(AUTH_LDAP); }) + Effects([] { HomeDisable(AUTH_LDAP); }), "");
  EXPECT_TRUE(log_.Contains("reason: KOVARecycleHomeEnumRecyclePathForAuthType failed. auth: 8"));
  EXPECT_TRUE(
      log_.Contains("(HomeDisable) Failed [0 > KOVARecycleHomeEnumRecyclePath(&list)], reason: "
                    "KOVARecycleHomeEnumRecyclePath failed. auth: 8"));
}

TEST_F(IndexMgrTest, RenameOfAUser) {
  Store({Entry("/homes/alice/docs"), Entry("/homes/alicia"), Entry("/homes/alice"), Entry("/photo/homes/alice")});
  EXPECT_EQ(Effects([] { UserRename("alice", "bob"); }),
            "saved; queue homes: rename /volume1/homes/alice -> /volume1/homes/bob; ");
  EXPECT_EQ(Stored(), "/homes/bob/docs dp; /homes/alicia dp; /homes/bob dp; /photo/homes/alice dp; ");
  EXPECT_TRUE(log_.Contains(" Update homes rule: [/homes/alice/docs] -> [/homes/bob/docs]"));
  EXPECT_EQ(Effects([] { UserRename("carol", "dave"); }),
            "queue homes: rename /volume1/homes/carol -> /volume1/homes/dave; ");
}

TEST_F(IndexMgrTest, SuggestionsOfTheNamedDatabases) {
  Store({Entry("/photo"), Entry("/music"), Entry("/photos")});
  EXPECT_EQ(Effects([] {
              UpdateTermSuggestion({"fileindex_photos", "fileindex_homes"});
            }),
            "document_get_by_query fileindex_photos; compound ; commit fileindex_photos; ");
  EXPECT_NE(platform_.sent[1].find(R"("doc_id_field":"/doc")"), std::string::npos);
}

}  // namespace ferrox::fileindex
