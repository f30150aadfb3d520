// Catches an unmounted volume that is taken for a deletion of all that was on it.
#include <sys/mount.h>

#include "platform/host/mounts.h"
#include "tests/indexd/worker_test.h"

namespace ferrox::indexd {
namespace {

/// A share on a volume that is mounted at a folder, played by moving folders about.
class VolumeTest : public WorkerTest {
 protected:
  void SetUp() override {
    is_mount_point = [this](const std::string& path) { return mounted && path == mount_point ? 1 : 0; };
    WorkerTest::SetUp();
  }
  void TearDown() override {
    worker->Stop();
    WorkerTest::TearDown();
  }

  void MountAt(const std::string& place) {
    mount_point = place;
    mounted = true;
    for (const char* name : {"a", "d/b", "d/c"}) test::WriteFile(At(name), name);
    worker = MakeWorker();
    Process(Line(kReindex, root));
    ASSERT_EQ(Expected(), Indexed());
  }
  void Unmount(bool leaves_folder) {
    mounted = false;
    fs::rename(root, root + ".away");
    if (leaves_folder) fs::create_directory(root);
  }
  void MountAgain() {
    if (fs::exists(root)) fs::remove(root);
    fs::rename(root + ".away", root);
    mounted = true;
  }

  std::string mount_point;
  std::atomic<bool> mounted{false};
};

TEST_F(VolumeTest, AwayVolumeIsNoDeletionAndIsComparedWhenItIsBack) {
  for (const bool is_root : {true, false}) {
    for (const bool restarted : {false, true}) {
      SCOPED_TRACE(testing::Message() << is_root << restarted);
      MountAt(is_root ? root : fs::path(root).parent_path().string());
      const std::set<std::string> before = Indexed();
      Unmount(is_root);
      Queue(Line(kReindex, root) + Line(kDelete, At("a")));
      if (restarted) Restart();
      worker->Start();
      WaitForState("waiting for volume");
      EXPECT_NE(std::string::npos, worker->Status()["detail"].asString().find("mount it at " + mount_point));
      EXPECT_EQ(3U + 1U, index->documents.size());
      test::WriteFile(root + ".away/d/b", "changed elsewhere");
      fs::remove(queue_path);
      MountAgain();
      WaitForState("idle");
      EXPECT_EQ(Expected(), Indexed());
      worker->Stop();
      kept = index->documents;
    }
  }
}

TEST_F(VolumeTest, UnmountedInTheMiddleOfAPassIsTakenUpAgain) {
  MountAt(root);
  test::WriteFile(At("a"), "changed");
  index->before_write = [this](const std::string& path) {
    if (path == At("a")) Unmount(true);
  };
  EXPECT_THROW(Process(Line(kModify, At("a")) + Line(kReindex, At("d"))), Error);
  index->before_write = nullptr;
  MountAgain();
  worker->RunOnce();
  EXPECT_EQ(Expected(), Indexed());
}

TEST_F(VolumeTest, FolderWithContentIsWhereTheShareIsNow) {
  MountAt(root);
  Unmount(true);
  test::WriteFile(At("moved"), "x");
  Process(Line(kReindex, root));
  EXPECT_EQ((std::set<std::string>{"moved=x"}), Indexed());
  fs::remove(At("moved"));
  Process(Line(kReindex, root));
  EXPECT_EQ(std::set<std::string>{}, Indexed()) << "no volume is known any more";
}

TEST_F(VolumeTest, RealMount) {
  is_mount_point = &kova::host::IsMountRoot;
  if (mount("none", root.c_str(), "tmpfs", 0, nullptr) != 0) GTEST_SKIP() << "needs the right to mount";
  MountAt("");
  const std::set<std::string> before = Indexed();
  ASSERT_EQ(0, umount(root.c_str()));
  EXPECT_THROW(Process(Line(kReindex, root)), Error);
  EXPECT_EQ(before.size(), index->documents.size());
  ASSERT_EQ(0, mount("none", root.c_str(), "tmpfs", 0, nullptr));
  test::WriteFile(At("a"), "another");
  worker->RunOnce();
  EXPECT_EQ(Expected(), Indexed());
  ASSERT_EQ(0, umount(root.c_str()));
}

}  // namespace
}  // namespace ferrox::indexd
