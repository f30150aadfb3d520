#include "platform/host/share_search.h"

#include <unistd.h>

#include <memory>
#include <vector>

#include <kova/fs.h>

#include "base/path.h"
#include "platform/host/configuration.h"
#include "platform/host/mounts.h"
#include "platform/host/share_table.h"

namespace kova::host {

namespace {

Json::Value NameList(const std::vector<std::string>& names) {
  Json::Value list(Json::arrayValue);
  for (const std::string& name : names) list.append(name);
  return list;
}

Json::Value RulesOf(const ShareUsers& users, const ShareNames& names) {
  Json::Value rules;
  rules["valid_users"] = NameList(users.valid);
  rules["invalid_users"] = NameList(users.invalid);
  rules["veto_files"] = NameList(names.veto);
  rules["hide_files"] = NameList(names.hide);
  if (names.case_counts) rules["case_counts"] = true;
  const std::string& closed = users.closed.empty() ? names.closed : users.closed;
  if (!closed.empty()) rules["closed"] = closed;
  return rules;
}

/// Whether an option stands in a list such as "rw,default_permissions".
bool HasOption(const std::string& options, const std::string& wanted) {
  return ("," + options + ",").find("," + wanted + ",") != std::string::npos;
}

/// Of the file system that holds a share's folder. One that cannot be asked tells nothing.
std::string RightsProblemAt(const std::string& root) {
  const int type = KOVAGetFSType(root.c_str(), 0);
  if (type < 0) return "the file system of " + root + " cannot be asked who may read its files";
  const Mounted mounted = MountedAt(root);
  return FileSystemRightsProblem(type, mounted.type, mounted.options);
}

}  // namespace

/// virtiofs has the kernel check each file's rights, and shows no option for it.
std::string FileSystemRightsProblem(int type, const std::string& mounted_type, const std::string& options) {
  const bool fuse = mounted_type.starts_with("fuse");
  if (fuse && !HasOption(options, "default_permissions")) {
    return "the file system " + mounted_type +
           " is mounted without default_permissions, and decides by itself who may "
           "read its files";
  }
  if (KOVAFSIsRemoteFS(type) == 1 || mounted_type == "9p") {
    return "its files lie on another machine, which decides who may read them";
  }
  if ((type == KOVA_FS_FAT || type == KOVA_FS_NTFS) && !fuse) {
    return "the file system " + mounted_type + " keeps no rights of files";
  }
  return {};
}

std::vector<std::string> FilesOfShares() {
  const std::shared_ptr<const Configuration> configuration = GetConfiguration();
  std::vector<std::string> files = {ShareTablePath(), ConfigurationPath()};
  const std::string& samba = configuration->samba.config;
  if (configuration->samba.shares && access(base::FolderOf(samba).c_str(), F_OK) == 0) files.push_back(samba);
  return files;
}

bool FindShareForSearch(const std::string& name, ShareForSearch& found) {
  const std::shared_ptr<const ShareTable> table = ShareTable::Current();
  const ShareEntry* entry = table != nullptr ? table->ByName(name) : nullptr;
  if (entry == nullptr) return false;
  found.root = entry->path;
  found.refused = entry->foreign_rights.empty() ? RightsProblemAt(entry->path) : entry->foreign_rights;
  found.rules = RulesOf(entry->users, entry->names);
  return true;
}

}  // namespace kova::host
