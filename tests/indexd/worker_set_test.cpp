// Catches shares without a worker or with an old one, and a hung engine that makes the daemon mute.
#include "services/fileindexd/worker_set.h"

#include <sys/socket.h>

#include <atomic>
#include <sstream>
#include <thread>

#include "common/paths.h"
#include "tests/indexd/worker_test.h"
#include "tests/support/unix_server.h"

namespace ferrox::indexd {
namespace {

class WorkerSetTest : public testing::Test {
 protected:
  WorkerSetTest() : workers_([this](const std::string& share) { return Make(share); }) {
    (void)kova::host::ListShares();
    for (const std::string name : {"a", "b"}) {
      fs::create_directory(base_ + "/" + name);
      kova::host::AddShare({name, base_ + "/" + name});
    }
  }
  ~WorkerSetTest() override {
    Configure("a", {});
    for (const auto& share : kova::host::ListShares()) kova::host::RemoveShare(share.name);
  }

  std::unique_ptr<ShareWorker> Make(const std::string& share) {
    ++made_;
    WorkerEnvironment environment{pool_, pause_};
    if (!asks_engine_) environment.open_index = [](const std::string&) { return std::make_unique<FakeIndex>(); };
    return std::make_unique<ShareWorker>(share, environment);
  }

  std::string Running() const {
    std::string names;
    for (const Json::Value& status : workers_.Status()) names += status["share"].asString();
    return names;
  }

  /// What the management operations and the platform do, one step a word; "look" is a reconciliation.
  void Do(const std::string& step) {
    if (step == "folders") Configure("a", {{"", "davp"}, {"/x", "d"}});
    if (step == "none") Configure("a", {});
    if (step == "paused") Configure("a", {{"", "davp"}, {"/x", "d"}}, true);
    if (step == "create") workers_.Create("a");
    if (step == "delete") workers_.Delete("a");
    if (step == "notify") workers_.SettingChanged("a");
    if (step == "gone") kova::host::RemoveShare("a");
    if (step == "back") kova::host::AddShare({"a", base_ + "/a"});
    if (step == "look") workers_.Reconcile();
  }

  const test::TempDir folder_;
  const std::string base_ = fs::canonical(folder_.Path()).string();
  const InterruptibleClock clock_;
  TaskPool pool_{2};
  PauseState pause_;
  int made_ = 0;
  bool asks_engine_ = false;
  WorkerSet workers_;
};

TEST_F(WorkerSetTest, SharesHaveAWorkerAsFoldersAndCommandsSay) {
  struct Row {
    const char* what;
    const char* steps;
    const char* running;
  };
  const Row rows[] = {
      {"a folder is added", "folders notify", "a"},
      {"noticed without a command", "folders look", "a"},
      {"the last folder goes", "folders look none notify", ""},
      {"a pause of the share, its flags saved last", "folders look delete look", ""},
      {"... and saved", "folders look delete look paused look", ""},
      {"... resumed, its flags cleared last", "paused look create look", "a"},
      {"... and cleared", "paused look create look folders look", "a"},
      {"... and paused again", "paused create folders look delete look", ""},
      {"a pause that failed half-way, and then a new folder", "folders look delete folders notify", "a"},
      {"a pause of the volume, its flags saved first", "folders look paused look delete look", ""},
      {"... resumed", "folders look paused delete look folders look create look", "a"},
      {"... or noticed before the command", "folders look paused delete look folders look", "a"},
      {"the volume's folders are cleared", "paused look none look", ""},
      {"the share goes and comes back", "folders look gone look back look", "a"},
      {"a share without folders", "none create notify look", ""},
  };
  for (const Row& row : rows) {
    SCOPED_TRACE(std::string(row.what) + ": " + row.steps);
    std::istringstream steps(row.steps);
    for (std::string step; steps >> step;) Do(step);
    EXPECT_EQ(row.running, Running());
    Do("none");
    Do("notify");
    EXPECT_EQ("", Running());
  }
}

TEST_F(WorkerSetTest, MovedShareGetsANewWorkerAndBrokenFilesChangeNothing) {
  Do("folders");
  Do("look");
  Do("look");
  EXPECT_EQ(1, made_);
  fs::create_directories(base_ + "/moved/a");
  kova::host::MoveShare("a", base_ + "/moved/a");
  Do("look");
  EXPECT_EQ(2, made_);
  EXPECT_EQ(base_ + "/moved/a", workers_.Status()[0]["path"].asString());
  for (const std::string& path : {kova::host::ShareTablePath(), InstancePath(kFileIndexFoldersCfgPath)}) {
    const std::string before = test::ReadFile(path);
    test::WriteFile(path, "{broken");
    EXPECT_THROW(Do("look"), Error);
    EXPECT_EQ("a", Running());
    test::WriteFile(path, before);
  }
}

/// The engine takes requests, and each answer ends in the middle.
TEST_F(WorkerSetTest, HungEngineMakesNobodyMute) {
  std::vector<base::UniqueFd> held;
  std::atomic<int> asked{0};
  const auto hang = [&](int fd) {
    (void)send(fd, "\x10\0\0\0{", 5, MSG_NOSIGNAL);
    held.emplace_back(dup(fd));
    ++asked;
  };
  fs::create_directories(fs::path(InstancePath(kElasticdSocket)).parent_path());
  const test::UnixServer engine(InstancePath(kElasticdSocket), hang, 1000);
  asks_engine_ = true;
  Configure("b", {{"", "davp"}});
  Do("folders");
  Do("look");
  for (int i = 0; asked < 2 && i < 6000; ++i) usleep(10000);
  std::thread ending([this] { Do("delete"); });
  EXPECT_NE(std::string::npos, Running().find('b'));
  ending.join();
  EXPECT_EQ("b", Running());
  Do("create");
  EXPECT_EQ("ab", Running());
  Configure("b", {});
  Do("none");
  Do("look");
  EXPECT_EQ("", Running());
}

}  // namespace
}  // namespace ferrox::indexd
