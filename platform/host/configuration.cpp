#include "platform/host/configuration.h"

#include <syslog.h>

#include <json/value.h>

#include <kova/instance.h>

#include "platform/host/files.h"
#include "platform/host/json_members.h"
#include "platform/host/log.h"
#include "platform/host/stat_cache.h"

namespace kova::host {

namespace {

/// An absolute path.
bool ReadPath(const Json::Value& object, const char* key, std::string& out) {
  return ReadMember(object, key, out) && (!object.isMember(key) || out.compare(0, 1, "/") == 0);
}

bool ReadSamba(const Json::Value& object, Configuration::Samba& samba) {
  return object.isObject() && ReadMember(object, "shares", samba.shares) && ReadPath(object, "config", samba.config) &&
         ReadPath(object, "testparm", samba.testparm) && ReadPath(object, "smbcontrol", samba.smbcontrol);
}

bool ReadNotifyd(const Json::Value& object, Configuration::Notifyd& notifyd) {
  constexpr uint32_t kScanIntervalMinSec = 1;
  return object.isObject() && ReadMember(object, "watch", notifyd.watch) &&
         ReadMember(object, "scan_interval", notifyd.scan_interval_sec) &&
         notifyd.scan_interval_sec >= kScanIntervalMinSec;
}

bool ReadWeb(const Json::Value& object, Configuration::Web& web) {
  return object.isObject() && ReadMember(object, "addresses", web.addresses) && ReadMember(object, "hosts", web.hosts);
}

bool ReadExclusions(const Json::Value& object, Configuration::Exclusions& exclusions) {
  return object.isObject() && ReadMember(object, "defaults", exclusions.defaults) &&
         ReadMember(object, "exclude", exclusions.lists.exclude) &&
         ReadMember(object, "exclude_content", exclusions.lists.exclude_content);
}

bool ReadEngine(const Json::Value& object, Configuration::Engine& engine) {
  constexpr uint32_t kMemoryMinMib = 32;
  return object.isObject() && ReadMember(object, "memory", engine.memory_mib) &&
         (!object.isMember("memory") || engine.memory_mib >= kMemoryMinMib);
}

Configuration Load(const std::string& path) {
  Configuration configuration;
  configuration.samba.config = InstanceRoot() + "/etc/samba/smb.conf";
  if (InstanceRoot().empty()) configuration.samba.smbcontrol = "/usr/bin/smbcontrol";
  configuration.web.addresses = {InstanceRoot().empty() ? "127.0.0.1:9280" : "127.0.0.1:0"};
  Json::Value value;
  configuration.problem = ReadJsonFile(path, value);
  if (!configuration.problem.empty() || value.isNull()) return configuration;
  const bool read = value.isObject() && ReadMember(value, "admin_group", configuration.admin_group) &&
                    ReadMember(value, "trusted_clients", configuration.trusted_clients) &&
                    ReadMember(value, "least_user", configuration.least_user) &&
                    (!value.isMember("exclusions") || ReadExclusions(value["exclusions"], configuration.exclusions)) &&
                    (!value.isMember("samba") || ReadSamba(value["samba"], configuration.samba)) &&
                    (!value.isMember("notifyd") || ReadNotifyd(value["notifyd"], configuration.notifyd)) &&
                    (!value.isMember("engine") || ReadEngine(value["engine"], configuration.engine)) &&
                    (!value.isMember("web") || ReadWeb(value["web"], configuration.web));
  if (!read) configuration.problem = "is not an object of settings, or one has the wrong type";
  return configuration;
}

}  // namespace

std::string ConfigurationPath() { return InstanceRoot() + "/etc/kova/kova.json"; }

std::shared_ptr<const Configuration> GetConfiguration() {
  static auto* cache = new StatCache<Configuration>;  // never freed, like the share table
  const std::string path = ConfigurationPath();
  std::shared_ptr<const Configuration> configuration = cache->Get(path, &Load);
  if (!configuration->problem.empty()) {
    LogChange(LOG_ERR, path,
              "the settings " + path + " cannot be used: the file " + configuration->problem +
                  "; correct it, or move it away to have the usual ones");
  }
  return configuration;
}

}  // namespace kova::host
