#include "services/kovanotifyd/ways.h"

#include <algorithm>
#include <utility>

#include "base/files.h"
#include "common/file_util.h"
#include "common/paths.h"
#include "services/kovanotifyd/filesystem/filesystem_watcher.h"
#include "services/kovanotifyd/folders/fan_inode_port.h"
#include "services/kovanotifyd/folders/folder_watcher.h"
#include "services/kovanotifyd/folders/inotify_port.h"

namespace ferrox::notifyd {

namespace {

struct KnownWay {
  const char* name;
  const char* cookie;  ///< the name of its file
  /// Null, and a `refusal`, when this host does not have what the way needs.
  std::unique_ptr<Watcher> (*make)(const std::string& cookie_path, std::string& refusal);
};

/// Never null: which capabilities and file systems it needs is found out for each root.
std::unique_ptr<Watcher> MakeFilesystemWatcher(const std::string& cookie_path, std::string& /*refusal*/) {
  FilesystemWatcher::Options options;
  options.cookie = cookie_path;
  for (const std::string& path : OwnPaths()) {
    if (path.back() == '/') options.quiet_folders.push_back(path);
  }
  return std::make_unique<FilesystemWatcher>(options);
}

std::unique_ptr<Watcher> MakeInodeWatcher(const std::string& cookie_path, std::string& refusal) {
  FanGroup group;
  refusal = group.Open();
  if (!refusal.empty()) return nullptr;
  return std::make_unique<FolderWatcher>(std::make_unique<FanInodePort>(std::move(group)),
                                         FolderWatcher::Options{cookie_path});
}

std::unique_ptr<Watcher> MakeInotifyWatcher(const std::string& cookie_path, std::string& refusal) {
  auto port = std::make_unique<InotifyPort>();
  refusal = port->Open();
  if (!refusal.empty()) return nullptr;
  return std::make_unique<FolderWatcher>(std::move(port), FolderWatcher::Options{cookie_path});
}

constexpr char kCookies[] = "/var/lib/kova/notifyd/cookies/";

/// The best first.
constexpr KnownWay kWays[] = {
    {"fanotify", "fanotify", MakeFilesystemWatcher},
    {"fanotify inode marks", "inode_marks", MakeInodeWatcher},
    {"inotify", "inotify", MakeInotifyWatcher},
};

bool IsKnown(const std::string& name) {
  return name == kPeriodicScan ||
         std::any_of(std::begin(kWays), std::end(kWays), [&name](const KnownWay& way) { return name == way.name; });
}

}  // namespace

void ChooseWays(const std::vector<std::string>& allowed, Notifier::Options& options) {
  const auto is_allowed = [&allowed](const char* name) {
    return std::find(allowed.begin(), allowed.end(), name) != allowed.end();
  };
  for (const std::string& name : allowed) {
    if (!IsKnown(name)) options.problems.push_back("\"" + name + "\" in the settings is no way to watch folders");
  }
  for (const KnownWay& known : kWays) {
    Way way = {known.name, nullptr, "switched off in the settings"};
    Cookie cookie(InstancePath((std::string(kCookies) + known.cookie).c_str()));
    if (is_allowed(known.name)) way.watcher = known.make(cookie.Path(), way.refusal);
    options.ways.push_back(std::move(way));
    options.cookies.push_back(std::move(cookie));
  }
  options.scans = is_allowed(kPeriodicScan);
}

std::vector<std::string> OwnPaths() {
  std::vector<std::string> paths;
  for (const char* folder : {"/var/lib/kova", "/var/log/kova", kConfigurationFolder, "/var/run"}) {
    const std::string path = InstancePath(folder);
    (void)base::MakeFolders(path);
    const std::string real = RealPath(path);
    paths.push_back((real.empty() ? path : real) + "/");
  }
  paths.push_back(RealPath(InstancePath("/tmp")) + "/ferrox_cfg_");
  return paths;
}

}  // namespace ferrox::notifyd
