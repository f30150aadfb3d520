// Catches steps of what is done to shares, volumes and users that are missing, misdirected or out of order.
#include "tests/library/index_mgr_fixture.h"

namespace ferrox::fileindex {

namespace {

std::string Paused(const std::string& share) {
  return "worker_delete share_name:" + share + "; unwatch(" + share + "); index_pause fileindex_" + share + "; ";
}

}  // namespace

TEST_F(IndexMgrTest, MissingArguments) {
  std::string missing;
  const auto call = [&](const auto& operation, const auto&... arguments) {
    missing += Does(operation, arguments...).substr(sizeof("throws 120 Missing")) + ", ";
  };
  call(&ShareRename, "", "b"), call(&ShareRename, "a", "");
  call(&ShareMigrate, "", "b", "c"), call(&ShareMigrate, "a", "", "c"), call(&ShareMigrate, "a", "b", "");
  call(&SharePause, ""), call(&ShareResume, ""), call(&ShareClearPaused, "", "b"), call(&ShareClearPaused, "a", "");
  call(&VolumePause, ""), call(&VolumeResume, ""), call(&VolumeClearPaused, "");
  call(&UserRename, "", "b"), call(&UserRename, "a", "");
  EXPECT_EQ(missing,
            "share_from, share_to, share_name, path_from, path_to, share name, share name, share name, "
            "share path, mount point, mount point, mount point, user_from, user_to, ");
}

TEST_F(IndexMgrTest, RenameAndMoveOfAShare) {
  Store("/old/old/a p; /older dp; odd dp; /old");
  EXPECT_EQ(Does(&ShareRename, "old", "photo"),
            "saved; index_config_set fileindex_old id:fileindex_photo,path:photo.index; "
            "queue photo: rename /volume1/old -> /volume1/photo; ");
  EXPECT_EQ(Stored(), "/photo/old/a p; /older dp; odd dp; /photo dp; ");
  EXPECT_EQ(Does(&ShareRename, "photo", "photo"),
            "index_config_set fileindex_photo id:fileindex_photo,path:photo.index; "
            "queue photo: rename /volume1/photo -> /volume1/photo; ");
  AddShare("volume1", "/volume1/");
  EXPECT_EQ(Does(&ShareRename, "x", "volume1"),
            "index_config_set fileindex_x id:fileindex_volume1,path:volume1.index; "
            "queue volume1: rename /volume1/x -> /volume1/volume1; ")
      << "a folder above the share has its name";
  EXPECT_EQ(Does(&ShareRename, "older", "nope"), "saved; throws 800 nope");
  EXPECT_TRUE(log_.Contains("Not done: rename the index of older; queue the rename of older"));

  const std::string photo = platform_.shares["photo"].path;
  EXPECT_EQ(
      Does(&ShareMigrate, "photo", "/volume7/photo", photo),
      "index_config_set fileindex_photo path:photo.index; queue photo: rename /volume7/photo -> /volume1/photo; ");
  EXPECT_EQ(Does(&ShareMigrate, "photos", "/volume7/photos", photo), "") << "has no folders";
}

TEST_F(IndexMgrTest, PauseAndResumeOfAShare) {
  Store("/photo/a; /photos; /photo");
  EXPECT_EQ(Does(&SharePause, "photo"), Paused("photo") + "saved; ");
  EXPECT_EQ(Stored(), "/photo/a dp paused; /photos dp; /photo dp paused; ");
  EXPECT_EQ(Does(&ShareResume, "photo"),
            "index_resume fileindex_photo; watch(photo); worker_create share_name:photo; saved; ");
  EXPECT_EQ(Stored(), "/photo/a dp; /photos dp; /photo dp; ");
  EXPECT_EQ(Does(&SharePause, "homes") + Does(&ShareResume, "homes"), "") << "has no folders";
  engine_fails_["index_pause"] = 1407;
  EXPECT_EQ(Does(&SharePause, "photo"), Paused("photo") + "throws 1407 Request failed, msg=m");
  EXPECT_EQ(Stored(), "/photo/a dp; /photos dp; /photo dp; ");
  platform_.failing["MonitorQueue::Delete"] = {};
  EXPECT_EQ(Does(&SharePause, "photo"),
            "worker_delete share_name:photo; unwatch(photo); throws 502 MonitorQueue::Delete failed, share=photo");
}

TEST_F(IndexMgrTest, AVolumeIsNotItsNamesake) {
  Store("/photo/a; /music; /photo; /homes; /gone");
  const std::string volume = test::TestRoot() + "/volume1";
  EXPECT_EQ(Does(&VolumePause, volume), "saved; " + Paused("homes") + Paused("photo"));
  EXPECT_EQ(Stored(),
            "/photo/a dp paused /volume1; /music dp; /photo dp paused /volume1; /homes dp paused /volume1; /gone dp; ");
  (void)Does(&SharePause, "music");
  (void)Does(&ShareResume, "homes");
  EXPECT_EQ(Does(&VolumeResume, volume),
            "saved; index_resume fileindex_photo; worker_create share_name:photo; watch(photo); ");
  EXPECT_EQ(Stored(), "/photo/a dp /volume1; /music dp paused; /photo dp /volume1; /homes dp /volume1; /gone dp; ");
  EXPECT_EQ(Does(&VolumeResume, volume + "0"),
            "saved; index_resume fileindex_music; worker_create share_name:music; watch(music); ");
}

TEST_F(IndexMgrTest, WhatWillNotComeBackIsForgotten) {
  Store("/photo/a; /photos; /photo");
  test::WriteFile(status_, R"({"share":{"homes":2,"photo":1,"photos":3}})");
  const std::string volume = test::TestRoot() + "/volume1";
  (void)Does(&VolumePause, volume);
  (void)Does(&ShareResume, "photos");
  EXPECT_EQ(Does(&VolumeClearPaused, volume + "0"), "");
  EXPECT_EQ(Does(&VolumeClearPaused, volume), "status homes:2,photos:3; saved; ");
  EXPECT_EQ(Stored(), "/photos dp /volume1; ");
  EXPECT_EQ(Does(&ShareClearPaused, "photos", platform_.shares["photos"].path),
            "rm(photos); rm(photos.tmp); rm(photos.index); status homes:2; index_delete fileindex_photos; saved; "
            "KOVASMBSetSpotlight(0); KLIBServiceRestart(samba); KLIBServiceStop(kovacontentextractd, 0); "
            "KLIBServicectlStop(pkg-Ferrox-fileindexd, 1); ");
  EXPECT_EQ(Does(&ShareClearPaused, "photo", "/"), "throws 502 FILEIDXQueuePathCompose failed, share_path=/");
  for (const char* odd : {"", "/", "//", "/a/..", "-rf"}) {
    platform_.composed_db_path = odd;
    EXPECT_EQ(Does(&ShareClearPaused, "photo", platform_.shares["photo"].path),
              "rm(photo); rm(photo.tmp); throws 502 FILEIDXDBPathCompose failed, share_path=/volume1/photo");
  }
}

TEST_F(IndexMgrTest, RecycleBins) {
  EXPECT_EQ(Does(&ShareCheckRecycle, "photo"), "queue photo: reindex /volume1/photo/#recycle; ");
  fs::remove_all(platform_.shares["music"].path);
  fs::create_directory_symlink(platform_.shares["photo"].path, platform_.shares["music"].path);
  EXPECT_EQ(Does(&ShareCheckRecycle, "music"), "") << "a link";
  EXPECT_EQ(Does(&ShareCheckRecycle, "nope"), "throws 800 nope");

  const std::string homes = platform_.shares["homes"].path;
  platform_.home_recycle_paths = {{homes + "/ann/#recycle", AUTH_LOCAL}, {homes + "/bob/#recycle", AUTH_LDAP}};
  EXPECT_EQ(Does(&HomeEnable, AUTH_LDAP), "queue homes: reindex /volume1/homes/bob/#recycle; ");
  EXPECT_EQ(Does(&HomeDisable, AUTH_LDAP), "queue homes: reindex /volume1/homes/ann/#recycle; ");
  platform_.home_recycle_paths = {{"", AUTH_LDAP}, {"/elsewhere", AUTH_LDAP}, {homes + "/z/#recycle", AUTH_LDAP}};
  EXPECT_EQ(Does(&HomeDisable, AUTH_LDAP), "status :1; ") << "ends at the first failure";
  platform_.failing = {{"KOVARecycleHomeEnumRecyclePathForAuthType", {}}, {"KOVARecycleHomeEnumRecyclePath", {}}};
  EXPECT_EQ(Does(&HomeEnable, AUTH_LDAP) + Does(&HomeDisable, AUTH_LDAP), "");
  EXPECT_TRUE(log_.Contains("reason: KOVARecycleHomeEnumRecyclePathForAuthType failed. auth: 8"));
  EXPECT_TRUE(log_.Contains("reason: KOVARecycleHomeEnumRecyclePath failed. auth: 8"));
}

TEST_F(IndexMgrTest, RenameOfAUser) {
  Store("/homes/alice/docs; /homes/alice2; /homes/alice; /photo/homes/alice");
  EXPECT_EQ(Does(&UserRename, "alice", "bob"),
            "saved; queue homes: rename /volume1/homes/alice -> /volume1/homes/bob; ");
  EXPECT_EQ(Stored(), "/homes/bob/docs dp; /homes/alice2 dp; /homes/bob dp; /photo/homes/alice dp; ");
  EXPECT_TRUE(log_.Contains(" Update homes rule: [/homes/alice/docs] -> [/homes/bob/docs]"));
  EXPECT_EQ(Does(&UserRename, "carol", "dave"), "queue homes: rename /volume1/homes/carol -> /volume1/homes/dave; ");
}

TEST_F(IndexMgrTest, SuggestionsOfTheNamedDatabases) {
  Store("/photo; /music; /photos");
  EXPECT_EQ(Does(&UpdateTermSuggestion, std::vector<std::string>{"fileindex_photos", "fileindex_homes"}),
            "document_get_by_query fileindex_photos; compound ; commit fileindex_photos; ");
  EXPECT_EQ(platform_.sent[1], R"({"compound":[{"command":"update_term_suggestion",)"
                               R"("data":{"db_name":"fileindex_photos","doc_id_field":"/doc"}}]})");
}

}  // namespace ferrox::fileindex
