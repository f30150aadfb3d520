#include <dirent.h>
#include <sys/stat.h>

#include <cerrno>
#include <memory>
#include <string>

#include <kova/recycle.h>

#include "base/files.h"
#include "platform/host/account_source.h"
#include "platform/host/share_table.h"
#include "platform/shared/failure.h"

using kova::host::ShareEntry;
using kova::host::ShareTable;

namespace {

constexpr char kHomesShare[] = "homes";

/// The share that `full_path` lies in and the path below it, without a leading "/".
const ShareEntry* Locate(const ShareTable& table, const std::string& full_path, std::string& below) {
  const ShareEntry* entry = table.ByFullPath(full_path);
  if (entry != nullptr && full_path.size() > entry->path.size()) below = full_path.substr(entry->path.size() + 1);
  return entry;
}

const std::string& HomeRecycleFolder(const ShareEntry& homes) {
  static const std::string usual = "#recycle";
  return homes.recycle.empty() ? usual : homes.recycle;
}

bool IsFolder(const std::string& path) {
  struct stat info = {};
  return lstat(path.c_str(), &info) == 0 && S_ISDIR(info.st_mode);
}

/// Appends the recycle bins of the homes of those users that `wanted` accepts; a home that cannot be read has none.
template <typename Wanted>
int EnumRecyclePaths(KLIBCSzList** list, Wanted wanted) {
  if (list == nullptr || *list == nullptr) return KOVA_FAIL(KOVA_ERR_BAD_PARAMETER);
  const std::shared_ptr<const ShareTable> table = ShareTable::Current();
  if (table == nullptr) return -1;
  const ShareEntry* homes = table->ByName(kHomesShare);
  if (homes == nullptr) return 0;
  const base::OpenFolderPtr folder(opendir(homes->path.c_str()));
  if (folder == nullptr) return KOVA_FAIL_ERRNO();
  int count = 0;
  errno = 0;
  for (const dirent* entry = readdir(folder.get()); entry != nullptr; entry = readdir(folder.get())) {
    const std::string user = entry->d_name, home = homes->path + "/" + user;
    const std::string bin = home + "/" + HomeRecycleFolder(*homes);
    const bool is_user = user != "." && user != ".." && user != HomeRecycleFolder(*homes);
    if (is_user && IsFolder(home) && IsFolder(bin) && wanted(user)) {
      if (KLIBCSzListPush(list, bin.c_str()) < 0) return -1;
      ++count;
    }
    errno = 0;
  }
  return errno == 0 ? count : KOVA_FAIL_ERRNO();
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
  (void)auth_types;  // callers ask for every kind
  const std::shared_ptr<const ShareTable> table = ShareTable::Current();
  if (full_path == nullptr || table == nullptr) return 0;
  std::string below;
  const ShareEntry* entry = Locate(*table, full_path, below);
  const size_t slash = below.find('/');
  if (entry == nullptr || entry->name != kHomesShare || slash == std::string::npos) return 0;
  return FirstComponent(below.substr(slash + 1)) == HomeRecycleFolder(*entry) ? 1 : 0;
}

int KOVARecycleHomeEnumRecyclePath(KLIBCSzList** list) {
  return EnumRecyclePaths(list, [](const std::string&) { return true; });
}

int KOVARecycleHomeEnumRecyclePathForAuthType(KLIBCSzList** list, AUTH_TYPE auth) {
  kova::host::AccountSources sources;
  return EnumRecyclePaths(list, [&](const std::string& user) { return (sources.Of(user) & auth) != 0; });
}
