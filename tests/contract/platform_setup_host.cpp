#include "platform/host/share_table.h"
#include "tests/contract/platform_setup.h"

namespace ferrox::test {

void SetShares(const std::vector<ShareSetup>& shares) {
  for (const kova::host::ShareEntry& old : kova::host::ListShares()) kova::host::RemoveShare(old.name);
  for (const ShareSetup& share : shares) {
    kova::host::ShareEntry entry = {share.name, share.path, share.Has('r') ? "#recycle" : ""};
    entry.encrypted = share.Has('e');
    entry.locked = share.Has('l');
    entry.read_only = share.Has('o');
    entry.hide_unreadable = share.Has('h');
    kova::host::AddShare(entry);
  }
}

}  // namespace ferrox::test
