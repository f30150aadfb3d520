#include "tests/contract/platform_setup.h"
#include "tests/support/fake_platform.h"

namespace ferrox::test {

void SetShares(const std::vector<ShareSetup>& shares) {
  FakePlatform& platform = FakePlatform::Get();
  platform.Reset();
  for (const ShareSetup& share : shares) {
    platform.shares[share.name] = {share.path,    2, share.Has('r'), share.Has('e'), share.Has('l'), share.Has('o'),
                                   share.Has('h')};
    if (share.Has('r')) platform.recycle_bins.insert(share.path + "/#recycle");
  }
}

}  // namespace ferrox::test
