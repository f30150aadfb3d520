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

}  // namespace ferrox::test
