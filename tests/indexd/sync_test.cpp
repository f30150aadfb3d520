// Catches a sync that returns before earlier changes are committed, or never.
#include <future>

#include "services/fileindexd/worker_set.h"
#include "tests/indexd/worker_test.h"

namespace ferrox::indexd {
namespace {

using std::chrono::seconds;
using std::chrono::steady_clock;

/// A started worker whose writes of a file named "held" wait until they are let go.
class SyncTest : public WorkerTest {
 protected:
  void SetUp() override {
    WorkerTest::SetUp();
    index->before_write = [this](const std::string& path) {
      if (fs::path(path).filename() != "held") return;
      held.set_value();
      go.get_future().wait();
    };
    worker->Start();
    WaitForState("idle");
    index->commits = 0;
  }
  void TearDown() override {
    worker->Stop();
    WorkerTest::TearDown();
  }

  void Change(const std::string& name) {
    test::WriteFile(At(name), name);
    const std::string queued = fs::exists(queue_path) ? test::ReadFile(queue_path) : "";
    test::WriteFile(folder / "queue", queued + Line(kCreate, At(name)));
    fs::rename(folder / "queue", queue_path);
  }
  std::string Sync(seconds longest = seconds(60)) {
    return worker->AwaitSync(worker->RequestSync(), steady_clock::now() + longest);
  }

  std::promise<void> held;
  std::promise<void> go;
};

TEST_F(SyncTest, ReturnsWhenWhatWasQueuedIsCommitted) {
  EXPECT_EQ(0U, worker->RequestSync()) << "nothing waits";
  Change("a");
  EXPECT_EQ("", Sync());
  EXPECT_EQ(Expected(), Indexed());
  EXPECT_EQ(1, index->commits);
}

TEST_F(SyncTest, WaitsForThePassUnderWayAndForWhatCameBehindIt) {
  Change("held");
  held.get_future().wait();
  Change("behind");
  const uint64_t request = worker->RequestSync();
  EXPECT_EQ("share " + share +
                ": its changes are still being indexed; give more time, 'fileindexctl status' shows how far it is",
            worker->AwaitSync(request, steady_clock::now()));
  go.set_value();
  EXPECT_EQ("", worker->AwaitSync(request, steady_clock::now() + seconds(60)));
  EXPECT_EQ((std::set<std::string>{"behind=behind", "held=held"}), Indexed());
  EXPECT_EQ(2, index->commits);
}

TEST_F(SyncTest, ChangesThatNeverEndAreNotWaitedFor) {
  std::atomic<int> changes{0};
  index->before_write = [this, &changes](const std::string&) {
    Queue(Line(kCreate, At("f"), std::to_string(++changes)));
  };
  Change("f");
  EXPECT_EQ("", Sync());
  index->before_write = nullptr;
}

TEST_F(SyncTest, ReasonIsToldUnlessItPassesByItself) {
  const std::string begin = "share " + share + ": ";
  std::atomic<int> failures{1};
  index->before_write = [&failures](const std::string&) {
    if (failures-- > 0) throw Error(Error::kEngineStorage, "the reason");
  };
  Change("f");
  EXPECT_EQ("", Sync()) << "what a killed engine lost is sent again meanwhile";
  failures = 1000;
  Change("g");
  EXPECT_EQ(begin + "the reason (1407)", Sync());
  pause.Set(0);
  worker->Wake();
  EXPECT_EQ(begin + "indexing is paused; 'fileindexctl resume' resumes it", Sync());
  const auto waiting = std::async(std::launch::async, [this] { return Sync(); });
  worker->Stop();
  waiting.wait();
  EXPECT_EQ(begin + "its indexing was just ended or begun anew; ask again", Sync());
}

TEST_F(SyncTest, SetAsksItsWorkersAndNamesSharesWithoutOne) {
  worker->Stop();  // one works on a queue
  WorkerSet workers([this](const std::string&) { return MakeWorker(); });
  workers.Reconcile();
  const auto end = steady_clock::now() + seconds(60);
  EXPECT_EQ("", workers.Sync({}, end));
  EXPECT_EQ("", workers.Sync({share}, end));
  EXPECT_EQ("share x: it is paused, or no folder of it is indexed; 'fileindexctl status' shows its state",
            workers.Sync({share, "x"}, end));
}

}  // namespace
}  // namespace ferrox::indexd
