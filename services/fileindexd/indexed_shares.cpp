#include "services/fileindexd/indexed_shares.h"

#include <set>
#include <utility>

#include <kova/error.h>

#include "base/path.h"
#include "common/error.h"
#include "fileindex/folders/folder_mgr.h"
#include "sdk/share.h"

namespace ferrox::indexd {

IndexedShares LoadIndexedShares() {
  const fileindex::FolderMgr folder_mgr;
  // All names at once: a share table that cannot be read must not look like one without shares.
  const std::vector<std::string> names = sdk::SDKShare::Enum();
  const std::set<std::string> existing(names.begin(), names.end());
  IndexedShares shares;
  for (const auto& folder : folder_mgr.GetFolders()) {
    if (folder->GetPath().empty() || folder->GetPath().front() != '/') continue;
    const std::string share = folder->GetShare();
    if (existing.count(share) == 0) continue;
    IndexedShare& indexed = shares[share];
    indexed.all_paused = indexed.all_paused && folder->IsPaused();
  }
  for (auto at = shares.begin(); at != shares.end();) {
    std::optional<std::string> root = RootOf(at->first);
    if (!root.has_value()) {
      at = shares.erase(at);
    } else {
      (at++)->second.root = std::move(*root);
    }
  }
  return shares;
}

std::optional<std::string> RootOf(const std::string& share) try {
  return sdk::SDKShare(share).GetPath();
} catch (const Error&) {
  if (KLIBCErrGet() != KOVA_ERR_NO_SUCH_SHARE) throw;
  return std::nullopt;
}

std::vector<std::string> InnerRoots(const IndexedShares& shares, const std::string& root) {
  std::vector<std::string> inner;
  for (const auto& [name, share] : shares) {
    if (base::IsBelow(share.root, root)) inner.push_back(share.root);
  }
  return inner;
}

}  // namespace ferrox::indexd
