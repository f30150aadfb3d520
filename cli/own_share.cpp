#include "cli/own_share.h"

#include <algorithm>
#include <vector>

#include "cli/command.h"
#include "common/error.h"
#include "sdk/share.h"

namespace ferrox::cli {

using kova::host::ShareTable;

bool IsShare(const std::string& name) {
  const std::vector<std::string> shares = sdk::SDKShare::Enum();
  return std::find(shares.begin(), shares.end(), name) != shares.end();
}

/// A table that cannot be used is said before anything else: every share would seem to be missing.
kova::host::ShareEntry OwnShare(const std::string& name, const std::string& verb) {
  const ShareTable table = ShareTable::Load(kova::host::ShareTablePath());
  if (!table.Problem().empty()) throw Failure(table.Problem());
  if (const kova::host::ShareEntry* entry = table.ByName(name)) return *entry;
  if (!IsShare(name)) throw Error(Error::kNoSuchShare, name);
  throw Failure("share " + name + " is kept by the file-sharing service; " + verb + " it there first");
}

}  // namespace ferrox::cli
