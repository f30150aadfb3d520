#include <filesystem>

#include "platform/host/notify_registry.h"
#include "platform/host/share_table.h"
#include "tests/contract/platform_setup.h"
#include "tests/support/temp_dir.h"

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

std::vector<std::string> SetHomes(const std::string& homes) {
  SetShares({{"homes", homes}});
  const std::string local = homes + "/root/#recycle", nobodys = homes + "/no-such-user-here/#recycle";
  for (const std::string& bin : {local, nobodys}) std::filesystem::create_directories(bin);
  std::filesystem::create_directories(homes + "/daemon/recycle");
  WriteFile(homes + "/bin/#recycle", "no folder");
  std::filesystem::create_directory_symlink(homes + "/root", homes + "/sys");
  std::filesystem::create_directory(homes + "/nobody");
  std::filesystem::create_directory_symlink(local, homes + "/nobody/#recycle");
  return {local, nobodys};
}

void SetSpotlight(const std::map<std::string, bool>& shares) {
  std::string text = "[global]\n";
  for (const auto& [name, on] : shares) text += "[" + name + "]\n  spotlight = " + (on ? "yes\n" : "no\n");
  WriteFile(TestRoot() + "/etc/samba/smb.conf", text);
}

std::vector<RegisteredQueue> RegisteredQueues() {
  std::vector<RegisteredQueue> queues;
  for (const kova::host::Registration& registration : kova::host::ReadRegistrations().list) {
    Json::Value document;
    document["queue"] = registration.queue;
    document["config"] = Json::arrayValue;
    for (const kova::host::Watch& watch : registration.watches) {
      Json::Value element;
      element["path"] = watch.path;
      element["mask"] = watch.mask;
      element["ignore"] = Json::arrayValue;
      for (const std::string& name : watch.ignore) element["ignore"].append(name);
      document["config"].append(element);
    }
    queues.emplace_back(registration.application, registration.type, document);
  }
  return queues;
}

}  // namespace ferrox::test
