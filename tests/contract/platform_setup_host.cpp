#include "platform/host/share_table.h"
#include "tests/contract/platform_setup.h"

namespace ferrox::test {

void SetShares(const std::vector<ShareSetup>& shares) {
  for (const kova::host::ShareEntry& old : kova::host::ListShares()) kova::host::RemoveShare(old.name);
  for (const ShareSetup& share : shares) {
    kova::host::ShareEntry entry;
    entry.name = share.name;
    entry.path = share.path;
    if (share.recycle) entry.recycle = "#recycle";
    entry.encrypted = share.encrypted;
    entry.locked = share.locked;
    entry.read_only = share.read_only;
    entry.hide_unreadable = share.hide_unreadable;
    kova::host::AddShare(entry);
  }
}

}  // namespace ferrox::test
