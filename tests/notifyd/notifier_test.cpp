// Catches a sync that promises too much or never ends, and registrations that disturb each other.
#include "services/kovanotifyd/notifier.h"

#include <filesystem>
#include <sstream>
#include <thread>

#include <gtest/gtest.h>

#include "common/error.h"
#include "fileindex/optree/optree.h"
#include "services/kovanotifyd/commands.h"
#include "tests/notifyd/fake_watcher.h"
#include "tests/support/log_capture.h"
#include "tests/support/temp_dir.h"

namespace ferrox::notifyd {
namespace {

namespace fs = std::filesystem;
using std::chrono::milliseconds;
using std::chrono::seconds;

constexpr uint32_t kAll = 0xFFC6;

/// The loop on a thread of its own, with a scripted watcher, a registry in memory and a queue on disk.
class NotifierTest : public testing::Test {
 protected:
  NotifierTest() {
    fs::create_directory(folder_);
    fs::create_directory(other_);
    registry_.list = {{"test", queue_, {{folder_, kAll}}}};
  }
  ~NotifierTest() override { Stop(); }

  void Start(const std::string& refusal = {}) {
    Notifier::Options options;
    options.registry_folder = dir_ / "registry";
    options.read_registry = [this] {
      const std::lock_guard guard(mutex_);
      return registry_;
    };
    options.cookies.emplace_back(dir_ / "cookie");
    auto fake = std::make_unique<FakeWatcher>(dir_ / "cookie");
    fake_ = fake.get();
    fake_->Refuse(refusal);
    fake_->Hold(held_);
    options.ways.push_back({"fake", std::move(fake)});
    options.own_paths = {folder_ + "/own/"};
    notifier_ = std::make_unique<Notifier>(std::move(options));
    thread_ = std::thread([this] { notifier_->Run(stop_.Get()); });
  }
  /// Started, and its first folder covered and compared.
  void StartCovered() {
    Start();
    WaitFor([this] { return notifier_->Status().queues[0].figures.written == 1; });
    (void)Lines();
  }
  void Stop() {
    (void)eventfd_write(stop_.Get(), 1);
    if (thread_.joinable()) thread_.join();
    notifier_.reset();
    eventfd_t count = 0;
    (void)eventfd_read(stop_.Get(), &count);
  }
  /// Replaces the registry and tells of it as its writers do.
  void Register(const Registry& registry) {
    {
      const std::lock_guard guard(mutex_);
      registry_ = registry;
    }
    test::WriteFile(dir_ / "registry/new", "");
    fs::rename(dir_ / "registry/new", dir_ / "registry/a.json");
  }
  std::string SyncProblem(milliseconds timeout) {
    try {
      (void)notifier_->Sync(timeout);
      return "none";
    } catch (const Error& error) {
      return error.what();
    }
  }
  /// The queue's lines since the last call, as "bits path", without the folder that all are in.
  std::string Lines() {
    std::istringstream stream(test::ReadFile(queue_));
    (void)remove(queue_.c_str());
    std::ostringstream text;
    for (std::string line; std::getline(stream, line);) {
      const fileindex::Event event(line);
      text << std::hex << event.event << " " << event.path.substr(dir_.Path().size()) << " ";
    }
    return text.str();
  }
  Change Created(const std::string& path) const { return {Change::Kind::kCreated, false, path}; }
  template <typename Condition>
  static void WaitFor(const Condition& condition) {
    const auto end = std::chrono::steady_clock::now() + seconds(60);
    while (!condition() && std::chrono::steady_clock::now() < end) std::this_thread::sleep_for(milliseconds(1));
    EXPECT_TRUE(condition());
  }

  const test::TempDir dir_;
  const std::string folder_ = dir_ / "folder";
  const std::string other_ = dir_ / "other";
  const std::string queue_ = dir_ / "queue";
  std::string held_;
  std::mutex mutex_;
  Registry registry_;
  FakeWatcher* fake_ = nullptr;
  base::UniqueFd stop_{eventfd(0, EFD_CLOEXEC | EFD_NONBLOCK)};
  std::unique_ptr<Notifier> notifier_;
  std::thread thread_;
};

TEST_F(NotifierTest, AfterASyncAllThatHappenedBeforeIsInTheQueue) {
  Start();
  EXPECT_TRUE(notifier_->Sync(seconds(60)).empty());
  EXPECT_EQ(Lines(), "10000 /folder ") << "what happened before the start is for a comparison";
  fake_->Say(Created(folder_ + "/a"));
  fake_->Say(Created(folder_ + "/own/b"));
  fake_->Say({Change::Kind::kModified, false, folder_ + "/c"});
  EXPECT_TRUE(notifier_->Sync(seconds(60)).empty());
  EXPECT_EQ(Lines(), "40 /folder/a 2 /folder/c ") << "c is still being written; b is the daemons' own";
  EXPECT_EQ(notifier_->Status().changes, 3);
}

TEST_F(NotifierTest, WithoutASyncChangesArriveByThemselves) {
  StartCovered();
  fake_->Say(Created(folder_ + "/a"));
  WaitFor([this] { return fs::exists(queue_) && fs::file_size(queue_) > 0; });
  EXPECT_EQ(Lines(), "40 /folder/a ");
}

TEST_F(NotifierTest, SyncsThatComeMeanwhileShareTheNextRound) {
  StartCovered();
  fake_->HoldCookies(true);
  std::vector<std::thread> threads;
  threads.emplace_back([this] { (void)notifier_->Sync(seconds(60)); });
  WaitFor([this] { return fake_->Touches() == 1; });
  for (int i = 0; i < 10; ++i) threads.emplace_back([this] { (void)notifier_->Sync(seconds(60)); });
  EXPECT_EQ(SyncProblem(milliseconds(50)), "changes are still being read (fake)");
  EXPECT_EQ(fake_->Touches(), 1) << "never again before it was reported";
  fake_->HoldCookies(false);
  for (std::thread& thread : threads) thread.join();
  EXPECT_EQ(fake_->Touches(), 2);
}

TEST_F(NotifierTest, ACookieLostWithOtherChangesDoesNotKeepASyncForEver) {
  StartCovered();
  fake_->HoldCookies(true);
  std::thread syncing([this] { (void)notifier_->Sync(seconds(60)); });
  WaitFor([this] { return fake_->Touches() == 1; });
  fake_->Say([](WatchListener& listener) { listener.OnLost(); });
  fake_->Say([this](WatchListener& listener) { listener.OnCovered(folder_); });
  syncing.join();
  EXPECT_EQ(Lines(), "10000 /folder ");
  EXPECT_EQ(notifier_->Status().lost, 1);
}

TEST_F(NotifierTest, ARegistrationDoesNotWaitForAnotherFoldersSetUp) {
  held_ = folder_;
  Start();
  Registry both = registry_;
  both.list.push_back({"test", dir_ / "queue2", {{other_, kAll}}});
  Register(both);
  WaitFor([this] { return notifier_->Status().queues.back().watches[0].state.covered; });
  fake_->Say(Created(other_ + "/a"));
  WaitFor([this] { return test::ReadFile(dir_ / "queue2").find("other/a\"") != std::string::npos; });
  EXPECT_FALSE(notifier_->Status().queues[0].watches[0].state.covered);
  EXPECT_EQ(SyncProblem(milliseconds(50)), "folders are still being set up to be watched");
  EXPECT_FALSE(fs::exists(queue_)) << "it is compared when it is covered, not before";
  fake_->Hold("");
  EXPECT_TRUE(notifier_->Sync(seconds(60)).empty());
  EXPECT_EQ(Lines(), "10000 /folder ");
}

TEST_F(NotifierTest, AWatcherThatRefusesAllIsNotWaitedFor) {
  held_ = folder_;
  Start("is broken");
  fake_->HoldCookies(true);
  std::thread syncing([this] { EXPECT_TRUE(notifier_->Sync(seconds(60)).empty()); });
  EXPECT_EQ(SyncProblem(milliseconds(50)), "folders are still being set up to be watched");
  fake_->Hold("");
  syncing.join();
  EXPECT_EQ(notifier_->Status().queues[0].watches[0].state.way, kPeriodicScan);
}

TEST_F(NotifierTest, WhatNobodyCanWatchIsComparedAtEachSync) {
  Start("is broken");
  EXPECT_TRUE(notifier_->Sync(seconds(60)).empty());
  EXPECT_NE(Lines(), "");
  for (int i = 0; i < 2; ++i) {
    EXPECT_TRUE(notifier_->Sync(seconds(60)).empty());
    EXPECT_EQ(Lines(), "10000 /folder ");
  }
}

TEST_F(NotifierTest, AWorkingRegistrationDoesNotSufferFromABadOneOrAMissingFolder) {
  const test::LogCapture log;
  registry_.problems = {"the registration x.json cannot be used"};
  registry_.list.push_back({"test", dir_ / "queue2", {{dir_ / "nowhere", kAll}}});
  Start();
  const std::string missing = "changes of " + dir_ / "nowhere" + " are not noticed: it is missing";
  EXPECT_EQ(notifier_->Sync(seconds(60)), (std::vector<std::string>{registry_.problems[0], missing}));
  EXPECT_EQ(Lines(), "10000 /folder ");
  (void)notifier_->Sync(seconds(60));
  EXPECT_EQ(notifier_->Status().problems, (std::vector<std::string>{registry_.problems[0], missing}));
  Stop();
  EXPECT_EQ(std::count(log.Lines().begin(), log.Lines().end(), registry_.problems[0]), 1);
}

TEST_F(NotifierTest, AStopKeepsWhatIsInMemoryAndFailsWhoWaits) {
  StartCovered();
  fake_->HoldCookies(true);
  std::string problem;
  std::thread syncing([&] { problem = SyncProblem(seconds(60)); });
  WaitFor([this] { return fake_->Touches() == 1; });
  fake_->Say({Change::Kind::kModified, false, folder_ + "/open"});
  (void)eventfd_write(stop_.Get(), 1);
  thread_.join();
  syncing.join();
  EXPECT_NE(problem.find("is being stopped"), std::string::npos) << problem;
  EXPECT_NE(SyncProblem(seconds(60)).find("is being stopped"), std::string::npos);
  EXPECT_EQ(Lines(), "2 /folder/open ");
}

TEST_F(NotifierTest, CommandsAreAnsweredInTheFormOfTheOtherDaemons) {
  Start();
  const auto ask = [this](const std::string& request, uid_t uid) {
    return HandleCommand(*notifier_, request + '\0', {uid, 0, 0});
  };
  EXPECT_EQ(ask(R"({"type":"sync","data":{"timeout_ms":60000}})", 0), R"({"data":{"problems":[]},"success":true})");
  for (const char* member : {R"("watch":"fake")", R"("kernel_watches":7)", R"("covered":true)", R"("written":1)"}) {
    EXPECT_NE(ask(R"({"type":"status","data":null})", geteuid()).find(member), std::string::npos) << member;
  }
  EXPECT_NE(ask(R"({"type":"sync","data":{"timeout_ms":600001}})", 0).find("\"code\":120"), std::string::npos);
  EXPECT_NE(ask(R"({"type":"none"})", 0).find("\"code\":120"), std::string::npos);
  EXPECT_NE(ask(R"({"type":"status"})", 12345).find("\"code\":1406"), std::string::npos);
}

}  // namespace
}  // namespace ferrox::notifyd
