// Catches folders that are indexed and not watched, or watched and no longer indexed.
#include "services/fileindexd/watch_registrations.h"

#include <kova/notifyd.h>

#include "platform/host/notify_registry.h"
#include "tests/indexd/worker_test.h"

namespace ferrox::indexd {
namespace {

/// The folders that are registered, below `base`.
std::set<std::string> Registered(const std::string& base) {
  std::set<std::string> watches;
  for (const auto& registration : kova::host::ReadRegistrations().list) {
    for (const auto& watch : registration.watches) {
      EXPECT_EQ(65478U, watch.mask);
      EXPECT_EQ(std::vector<std::string>{"@eaDir"}, watch.ignore);
      const bool ours = watch.path.compare(0, base.size(), base) == 0;
      watches.insert(ours ? watch.path.substr(base.size()) : watch.path);
    }
  }
  return watches;
}

TEST(WatchRegistrationsTest, FollowFoldersAndSharesThatChangeWithoutARegistration) {
  const test::TempDir folder;
  const std::string base = fs::canonical(folder.Path()).string();
  for (const char* path : {"/1/w", "/2/w", "/1/other"}) fs::create_directories(base + path);
  kova::host::AddShare({"w", base + "/1/w"});
  const std::string first_queue = sdk::SDKShare("w").GetQueuePath();
  Json::Value strangers;
  strangers["queue"] = base + "/strangers.queue";
  strangers["config"] = Json::arrayValue;
  ASSERT_TRUE(KOVA::KOVANOTIFYD::MonitorQueue::Upsert(KOVA::KOVANOTIFYD::MonitorQueue(strangers), "stranger", 1));

  WatchRegistrations registrations;
  Configure("w", {{"/a", "d"}, {"/b", "d"}});
  registrations.Reconcile();
  EXPECT_EQ((std::set<std::string>{"/1/w/a", "/1/w/b"}), Registered(base));

  Configure("w", {{"/renamed", "d"}});
  registrations.Reconcile();
  EXPECT_EQ((std::set<std::string>{"/1/w/renamed"}), Registered(base));

  kova::host::RemoveShare("w");
  registrations.Reconcile();
  EXPECT_EQ((std::set<std::string>{"/1/w/renamed"}), Registered(base))
      << "a share that cannot be found keeps its watches";

  kova::host::AddShare({"w", base + "/2/w"});
  ASSERT_NE(first_queue, sdk::SDKShare("w").GetQueuePath());
  registrations.Reconcile();
  EXPECT_EQ((std::set<std::string>{"/2/w/renamed"}), Registered(base));

  Configure("w", {});
  registrations.Reconcile();
  EXPECT_EQ(std::set<std::string>{}, Registered(base));
  EXPECT_EQ(1U, kova::host::ReadRegistrations().list.size()) << "another application's registration stays";

  kova::host::RemoveShare("w");
  EXPECT_TRUE(KOVA::KOVANOTIFYD::MonitorQueue::Delete(base + "/strangers.queue", "stranger", 1));
}

}  // namespace
}  // namespace ferrox::indexd
