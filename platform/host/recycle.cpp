#include <string>

#include <kova/recycle.h>

#include "platform/host/share_table.h"

using kova::host::ShareEntry;
using kova::host::ShareTable;

namespace {

constexpr char kHomesShare[] = "homes";
constexpr char kUsualRecycleFolder[] = "#recycle";

/// The share that `full_path` lies in and the path below it, without a leading "/".
const ShareEntry* Locate(const ShareTable& table, const std::string& full_path, std::string& below) {
  const ShareEntry* entry = table.ByFullPath(full_path);
  if (entry != nullptr && full_path.size() > entry->path.size()) below = full_path.substr(entry->path.size() + 1);
  return entry;
}

std::string FirstComponent(const std::string& path) { return path.substr(0, path.find('/')); }

}  // namespace

int KOVAShareIsShareRecycle(const char* full_path) {
  const std::shared_ptr<const ShareTable> table = ShareTable::Current();
  if (full_path == nullptr || table == nullptr) return 0;
  std::string below;
  const ShareEntry* entry = Locate(*table, full_path, below);
  return entry != nullptr && !entry->recycle.empty() && FirstComponent(below) == entry->recycle ? 1 : 0;
}

int KOVARecycleUserHomePathIsExist(const char* full_path, int auth_types) {
  (void)auth_types;  // this host knows one kind of users
  const std::shared_ptr<const ShareTable> table = ShareTable::Current();
  if (full_path == nullptr || table == nullptr) return 0;
  std::string below;
  const ShareEntry* entry = Locate(*table, full_path, below);
  const size_t slash = below.find('/');
  if (entry == nullptr || entry->name != kHomesShare || slash == std::string::npos) return 0;
  const std::string& folder = entry->recycle.empty() ? kUsualRecycleFolder : entry->recycle;
  return FirstComponent(below.substr(slash + 1)) == folder ? 1 : 0;
}
