#include "services/kovawebd/settings.h"

#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <json/value.h>

#include "base/files.h"
#include "base/unique_fd.h"
#include "common/error.h"
#include "common/file_util.h"
#include "common/json_util.h"
#include "common/log.h"
#include "common/paths.h"
#include "services/support/instance_owner.h"
#include "services/support/own_account.h"
#include "services/support/web_user.h"

namespace ferrox::web {

namespace {

using services::EngineIds;

constexpr char kTokensFile[] = "/tokens.json";

/// Of a daemon that was root's until now: its only file.
bool GiveTokens(const EngineIds& to) {
  const std::string path = InstancePath(services::kWebFolder) + kTokensFile;
  const base::UniqueFd file(open(path.c_str(), O_PATH | O_NOFOLLOW | O_CLOEXEC));
  struct stat status = {};
  const bool is_roots = file.Valid() && fstat(file.Get(), &status) == 0 && S_ISREG(status.st_mode) &&
                        status.st_uid == 0 && status.st_nlink == 1;
  return !is_roots || fchownat(file.Get(), "", to.uid, to.gid, AT_EMPTY_PATH) == 0;
}

bool TellSettings(const Settings& settings) {
  Json::Value copy;
  copy["addresses"] = Vec2JsonArr(settings.addresses);
  copy["hosts"] = Vec2JsonArr(settings.hosts);
  return WriteWholeFile(InstancePath(services::kWebSettingsCopy), toString(copy)) &&
         chmod(InstancePath(services::kWebSettingsCopy).c_str(), 0644) == 0;
}

void Prepare(const EngineIds& to, const Settings& settings) {
  FERROX_FAIL_IF(geteuid() != 0 || !services::IsRootsInstance(), Error::kInternal,
                 "only root can give the web daemon a user of its own, and in an instance of root's");
  services::ClosePrivateFolders();
  const bool made = base::MakeFolders(InstancePath("/var/run")) && base::MakeFolders(InstancePath("/var/lib/kova")) &&
                    services::GivePidFile("kovawebd", to) &&
                    services::GiveOwnFolder(InstancePath(services::kWebRunFolder), 0755, to) &&
                    TellSettings(settings) && GiveTokens(to) &&
                    services::GiveOwnFolder(InstancePath(services::kWebFolder), 0700, to);
  FERROX_FAIL_IF(!made, Error::kInternal, "the folders of the web daemon's user cannot be made: " + ErrnoText());
  const std::optional<EngineIds> now = services::WebUser();
  FERROX_FAIL_IF(!now.has_value() || now->uid != to.uid, Error::kInternal,
                 InstancePath(services::kWebFolder) +
                     " is not the web daemon's: each folder above it must be root's, " + "and nobody else's to change");
}

Settings SettingsAsTold() {
  const std::string path = InstancePath(services::kWebSettingsCopy);
  Json::Value copy;
  FERROX_FAIL_IF(!fromFile(copy, path) || !copy.isObject(), Error::kInternal,
                 path + " is missing or unreadable; root writes it by 'kovawebd --prepare USER'");
  return {JsonArr2Vec<std::string>(copy["addresses"]), JsonArr2Vec<std::string>(copy["hosts"])};
}

}  // namespace

std::string TokensPath() {
  const std::string folder = InstancePath(services::kWebFolder);
  FERROX_FAIL_IF(!base::MakeFolders(folder, 0700), Error::kInternal, "cannot make " + folder + ": " + ErrnoText());
  return folder + kTokensFile;
}

void PrepareForUser(const std::string& user, const Settings& settings) {
  Prepare(services::IdsOfAccount(user, "the web daemon"), settings);
}

Settings BecomeOwnUser(const ReadSettings& read) {
  const std::optional<EngineIds> own = services::WebUser();
  if (geteuid() != 0) return own.has_value() ? SettingsAsTold() : read();
  Settings settings = read();
  if (!own.has_value()) return settings;
  Prepare(*own, settings);
  services::BecomeUser(*own);
  return settings;
}

}  // namespace ferrox::web
