#include "platform/host/configuration.h"

#include <json/value.h>

#include <kova/instance.h>

#include "platform/base/failure.h"
#include "platform/host/files.h"
#include "platform/host/stat_cache.h"

namespace kova::host {

namespace {

Configuration Load(const std::string& path) {
  Configuration configuration;
  Json::Value value;
  configuration.problem = ReadJsonFile(path, value);
  if (!configuration.problem.empty() || value.isNull()) return configuration;
  if (!value.isObject() || (value.isMember("admin_group") && !value["admin_group"].isString())) {
    configuration.problem = "is not an object of settings";
  } else if (value.isMember("admin_group")) {
    configuration.admin_group = value["admin_group"].asString();
  }
  return configuration;
}

}  // namespace

bool GetConfiguration(Configuration& configuration) {
  static auto* cache = new StatCache<Configuration>;  // never freed, like the share table
  configuration = *cache->Get(InstanceRoot() + "/etc/kova/kova.json", &Load);
  if (configuration.problem.empty()) return true;
  (void)KOVA_FAIL(KOVA_ERR_BAD_CONFIGURATION);
  return false;
}

}  // namespace kova::host
