#include "tests/contract/platform_setup.h"
#include "tests/support/fake_platform.h"

namespace ferrox::test {

void SetShares(const std::vector<ShareSetup>& shares) {
  FakePlatform& platform = FakePlatform::Get();
  platform.Reset();
  for (const ShareSetup& share : shares) {
    FakeShare& fake = platform.shares[share.name];
    fake.path = share.path;
    fake.recycle = share.recycle ? 1 : 0;
    fake.encryption = share.encrypted ? 1 : 0;
    fake.encrypted = share.locked ? 1 : 0;
    fake.read_only = share.read_only ? 1 : 0;
    fake.hide_unreadable = share.hide_unreadable ? 1 : 0;
    if (share.recycle) platform.recycle_bins.insert(share.path + "/#recycle");
  }
}

std::vector<std::string> SetHomes(const std::string& homes) {
  SetShares({{"homes", homes}});
  const std::string local = homes + "/root/#recycle", nobodys = homes + "/no-such-user-here/#recycle";
  FakePlatform::Get().home_recycle_paths = {{local, AUTH_LOCAL}, {nobodys, AUTH_TYPE()}};
  return {local, nobodys};
}

void SetSpotlight(const std::map<std::string, bool>& shares) {
  int on = 1;
  for (const auto& share : shares) on &= share.second ? 1 : 0;
  FakePlatform::Get().spotlight = on;
}

std::vector<RegisteredQueue> RegisteredQueues() {
  std::vector<RegisteredQueue> queues;
  for (const auto& [key, document] : FakePlatform::Get().monitor_queues) {
    queues.emplace_back(std::get<0>(key), std::get<1>(key), document);
  }
  return queues;
}

}  // namespace ferrox::test
