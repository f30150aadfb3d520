// Catches rights that the index has wrong, or learns late, and files that are read for them.
#include <sys/stat.h>

#include <atomic>

#include "tests/indexd/worker_test.h"

namespace ferrox::indexd {
namespace {

class AccessTest : public WorkerTest {
 protected:
  void Make(int files) {
    for (int i = 0; i < files; ++i) test::WriteFile(At("f" + std::to_string(i)), "x");
    Process(Line(kReindex, root));
    index->upserts.clear();
    index->access_sets.clear();
  }
  void Chmod(const std::string& name, mode_t mode) const { ASSERT_EQ(0, chmod(At(name).c_str(), mode)); }
  std::string AttrLine(const std::string& path) const {  // as the notification daemon writes it
    return R"({"event":4,"is_dir":false,"path":")" + path + "\",\"path_old\":\"\",\"data\":null}\n";
  }
  static std::string OnDisk(const std::string& path) {
    struct stat status = {};
    EXPECT_EQ(0, lstat(path.c_str(), &status)) << path;
    return KOVA::CONTENT_EXTRACT::Access(path, status);
  }
  void ExpectRightsOfDisk() {
    for (const auto& [path, document] : index->documents) EXPECT_EQ(OnDisk(path), document.access) << path;
    for (const auto& [path, access] : index->folders) EXPECT_EQ(OnDisk(path), access) << path;
    EXPECT_NE(0U, index->folders.count(root));
  }
};

TEST_F(AccessTest, ChangesAreRecordedTogetherAndOnlyWhatDiffersIsRead) {
  Make(1100);
  std::string lines = AttrLine(At("new"));
  for (int i = 0; i < 1100; ++i) {
    Chmod("f" + std::to_string(i), 0600);
    lines += AttrLine(At("f" + std::to_string(i)));
  }
  test::WriteFile(At("f7"), "written, too");
  test::WriteFile(At("new"), "has no document");
  Process(lines);
  ExpectRightsOfDisk();
  EXPECT_EQ(Expected(), Indexed());
  EXPECT_EQ((std::map<std::string, int>{{At("f7"), 1}, {At("new"), 1}}), index->upserts);
  EXPECT_EQ((std::multiset<size_t>{1000, 101, 1}), index->access_sets) << "one of them has the share's folder";
}

TEST_F(AccessTest, TheEngineIsToldWhoMaySearchTheShareAndWhenItIsReady) {
  wire::IndexShare now = {share, root, "", Json::Value(Json::objectValue)};
  describe_share = [&](const std::string&) { return now; };
  worker = MakeWorker();
  bool fails = true;
  index->before_note = [&](const wire::IndexShare&) {
    if (fails) throw Error(Error::kEngineStorage, "full");
  };
  EXPECT_THROW(worker->RunOnce(), Error);
  fails = false;
  for (int i = 0; i < 3; ++i) worker->RunOnce();
  EXPECT_EQ(std::vector<std::string>{share + "|"}, index->notes) << "until it is told, and once";
  now.refused = "no rights";
  now.rules["closed"] = "a macro";
  worker->RunOnce();
  EXPECT_EQ(share + "|no rights", index->notes.back());
  EXPECT_EQ("no rights", worker->Status()["refused"].asString());
  EXPECT_EQ("a macro", worker->Status()["closed"].asString());
  now = {share, "/elsewhere/" + share};
  worker->RunOnce();
  EXPECT_EQ(2U, index->notes.size()) << "its documents are not those of the new folder";

  test::WriteFile(At("a"), "x");
  Process(Line(kReindex, root));
  EXPECT_EQ(0, index->prepared);
  index->documents[At("a")].access.clear();
  Restart();
  index->after_access = [&](const std::vector<wire::SeenAccess>&) { EXPECT_EQ(0, index->prepared); };
  for (int i = 0; i < 2; ++i) worker->RunOnce();
  EXPECT_EQ(1, index->prepared);
  EXPECT_EQ(OnDisk(At("a")), index->documents[At("a")].access);
}

TEST_F(AccessTest, RightsOvertakeContentUnderEachNameOfAFile) {
  early_write_interval = std::chrono::milliseconds(0);
  worker = MakeWorker();
  test::WriteFile(At("d/a"), "1");
  fs::create_hard_link(At("d/a"), At("d/b"));
  fs::create_hard_link(At("d/a"), folder / "outside" + share);
  Make(300);
  for (const std::string& path : {At("d/a"), root}) Chmod(path.substr(root.size()), 0700);
  std::atomic<int> names{0};
  index->after_access = [&](const std::vector<wire::SeenAccess>& records) {
    for (const auto& record : records) names += record.path == At("d/a") || record.path == At("d/b");
  };
  std::atomic<bool> changed{false};
  index->before_read = [&](const std::string&) {
    if (changed.exchange(true)) return;
    struct stat status = {};
    ASSERT_EQ(0, chmod((folder / "outside" + share).c_str(), 0640));
    ASSERT_EQ(0, lstat(At("d/a").c_str(), &status));
    Queue(R"({"event":0,"is_dir":true,"path":")" + root + R"(","path_old":"","data":{"files":[)" +
          std::to_string(status.st_ino) + "]}}\n");
    for (int i = 0; names < 2 && i < 6000; ++i) usleep(10000);
  };
  for (int i = 0; i < 300; ++i) test::WriteFile(At("f" + std::to_string(i)), "changed");
  fs::remove(queue_path);
  Process(Line(kReindex, root));
  EXPECT_LE(2, names) << "while the first file was still being read";
  ExpectRightsOfDisk();
}

TEST_F(AccessTest, ChangeBetweenReadingAndWritingIsNotLost) {
  test::WriteFile(At("f"), "1");
  index->after_read = [](const std::string& path) { EXPECT_EQ(0, chmod(path.c_str(), 0604)); };
  Process(Line(kCreate, At("f")));
  int changes = 0;
  index->after_access = [this, &changes](const auto&) {  // another thread has recorded this already
    if (++changes == 1) Chmod("f", 0640);
  };
  Process(AttrLine(At("f")));
  ExpectRightsOfDisk();
}

TEST_F(AccessTest, IndexFromBeforeRightsWereRecordedIsComparedOnce) {
  SetFolders({{"/on/the/way", "davp"}});
  test::WriteFile(At("on/the/way/f"), "1");
  Process(Line(kReindex, root));
  for (auto& [path, document] : index->documents) document.access.clear();
  Restart();
  worker->RunOnce();
  ExpectRightsOfDisk();
  EXPECT_TRUE(index->upserts.empty());
  EXPECT_EQ(2U, worker->Status()["comparison"]["examined"].asUInt());
  for (const char* name : {"", "on", "on/the"}) Chmod(name, 0711);
  Process(AttrLine(At("on/the/way")));  // which stands for all above it
  ExpectRightsOfDisk();
  EXPECT_EQ(3U, index->folders.size());
}

}  // namespace
}  // namespace ferrox::indexd
