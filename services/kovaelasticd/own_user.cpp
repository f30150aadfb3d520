#include "services/kovaelasticd/own_user.h"

#include <fcntl.h>
#include <sys/stat.h>
#include <syslog.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <cstdlib>
#include <memory>
#include <vector>

#include <json/value.h>

#include "base/files.h"
#include "base/path.h"
#include "common/error.h"
#include "common/file_util.h"
#include "common/json_util.h"
#include "common/log.h"
#include "common/paths.h"
#include "services/support/engine_user.h"
#include "services/support/instance_owner.h"
#include "services/support/own_account.h"
#include "wire/frame_client.h"

namespace ferrox::engine {

namespace {

using services::EngineIds;

constexpr char kIndexFolder[] = "/var/lib/kova/fileindex/db";

/// A folder that only root can change, opened from "/" on without following a link; invalid when there is none.
base::UniqueFd OpenRootsFolder(const std::string& path, bool is_real = false) {
  std::string real = path;
  if (!is_real) {  // the way to it is root's own: links in it are the administrator's
    const std::unique_ptr<char, decltype(&free)> resolved(realpath(path.c_str(), nullptr), &free);
    if (resolved == nullptr) return {};
    real = resolved.get();
  }
  base::UniqueFd folder(open("/", O_RDONLY | O_DIRECTORY | O_CLOEXEC));
  for (size_t at = 1; folder.Valid() && at < real.size();) {
    const size_t end = std::min(real.find('/', at), real.size());
    const std::string name = real.substr(at, end - at);
    struct stat status = {};
    const bool is_safe = fstat(folder.Get(), &status) == 0 && status.st_uid == 0 &&
                         (!services::MayOthersWrite(status) || (status.st_mode & S_ISVTX) != 0);
    if (!is_safe || name == "..") return {};
    if (!name.empty() && name != ".")
      folder.Reset(openat(folder.Get(), name.c_str(), O_RDONLY | O_DIRECTORY | O_NOFOLLOW | O_CLOEXEC));
    at = end + 1;
  }
  return folder;
}

std::vector<std::string> NamesIn(int folder) {
  std::vector<std::string> names;
  const base::OpenFolderPtr listing(fdopendir(openat(folder, ".", O_RDONLY | O_DIRECTORY | O_CLOEXEC)));
  while (const dirent* entry = listing != nullptr ? readdir(listing.get()) : nullptr) {
    const std::string name = entry->d_name;
    if (name != "." && name != "..") names.push_back(name);
  }
  return names;
}

bool GiveFile(int folder, const std::string& name, const EngineIds& to) {
  const base::UniqueFd file(openat(folder, name.c_str(), O_PATH | O_NOFOLLOW | O_CLOEXEC));
  struct stat status = {};
  const bool is_ours = file.Valid() && fstat(file.Get(), &status) == 0 && S_ISREG(status.st_mode) &&
                       status.st_uid == 0 && status.st_nlink == 1;
  return !is_ours || fchownat(file.Get(), "", to.uid, to.gid, AT_EMPTY_PATH) == 0;
}

/// A folder of root's with the files in it, the folder last. One that is not root's, or that others may change, stays.
bool GiveFolder(int folder, const EngineIds& to) {
  struct stat status = {};
  if (fstat(folder, &status) != 0) return false;
  if (status.st_uid != 0 || services::MayOthersWrite(status)) return true;
  for (const std::string& name : NamesIn(folder)) {
    if (!GiveFile(folder, name, to)) return false;
  }
  return fsync(folder) == 0 && fchown(folder, to.uid, to.gid) == 0;
}

bool GiveFolderAt(const std::string& path, const EngineIds& to) {
  const base::UniqueFd folder = OpenRootsFolder(path);
  return folder.Valid() && GiveFolder(folder.Get(), to);
}

/// The folder in which the platform lets indices lie, with those of root's in it. A folder of root's that lies in one
/// of somebody else's was made there by root: nobody else can move it in.
bool GiveIndices(const EngineIds& to) {
  const base::UniqueFd all = OpenRootsFolder(InstancePath(kIndexFolder));
  if (!all.Valid()) return false;
  for (const std::string& name : NamesIn(all.Get())) {
    const base::UniqueFd one(openat(all.Get(), name.c_str(), O_RDONLY | O_DIRECTORY | O_NOFOLLOW | O_CLOEXEC));
    if (one.Valid() && !GiveFolder(one.Get(), to)) return false;
  }
  return GiveFolder(all.Get(), to);
}

bool IsRootsAlone(const std::string& path) {
  const base::UniqueFd folder = OpenRootsFolder(InstancePath(path.c_str()));
  struct stat status = {};
  return folder.Valid() && fstat(folder.Get(), &status) == 0 && status.st_uid == 0 && !services::MayOthersWrite(status);
}

/// Whether an index is all that the folder holds.
bool HoldsIndexAlone(int folder) {
  const std::vector<std::string> names = NamesIn(folder);
  return !names.empty() && std::all_of(names.begin(), names.end(), [](const std::string& name) {
    return name.starts_with("index.sqlite") || name == "uncommitted";
  });
}

/// Those that somebody had made elsewhere, by the list, which is believed only as long as it is root's.
void GiveOtherIndices(const EngineIds& to) {
  const std::string list = InstancePath(kElasticdFolder) + "/indices.json";
  std::string text;
  Json::Value indices;
  if (!ReadWholeFile(list, text) || !fromString(indices, text) || !indices.isObject()) return;
  for (const std::string& id : indices.getMemberNames()) {
    const Json::Value& path = indices[id]["path"];
    if (!path.isString() || path.asString().starts_with(InstancePath(kIndexFolder) + "/")) continue;
    const base::UniqueFd folder = OpenRootsFolder(path.asString(), true);
    if (folder.Valid() && HoldsIndexAlone(folder.Get()) && GiveFolder(folder.Get(), to)) continue;
    Log(LOG_WARNING,
        "the index in %s is not given to the engine's user, since others can change a folder above it, or the folder "
        "holds more than an index",
        path.asString().c_str());
  }
}

/// The link stands where an engine of root's has its socket, so that clients need not know.
bool MakeSocketLink() {
  const std::string path = InstancePath(kElasticdSocket);
  const std::string target = std::string(kElasticdOwnSocket).substr(base::FolderOf(kElasticdSocket).size() + 1);
  struct stat status = {};
  char link[64] = {};
  if (readlink(path.c_str(), link, sizeof(link) - 1) > 0 && link == target) return true;
  const bool there = lstat(path.c_str(), &status) == 0;
  FERROX_FAIL_IF(there && S_ISSOCK(status.st_mode) && wire::IsServed(path), Error::kInternal,
                 path + " is served by another process; stop it first");
  if (there && unlink(path.c_str()) != 0) return false;
  return symlink(target.c_str(), path.c_str()) == 0;
}

/// Folders that are there keep their modes, but that of what is between, which held nothing for others before.
bool MakeFoldersForUser() {
  const std::string indices = InstancePath(kIndexFolder);
  const std::string between = base::FolderOf(indices);
  for (const char* folder : {"/tmp", "/var/run", "/var/lib/kova"}) {
    if (!base::MakeFolders(InstancePath(folder))) return false;
  }
  for (const char* folder : {"/var/run", "/var/lib/kova"}) {
    FERROX_FAIL_IF(!IsRootsAlone(folder), Error::kInternal,
                   InstancePath(folder) + " and each folder above it must be root's, and nobody else's to change");
  }
  struct stat status = {};
  return base::MakeFolders(InstancePath(kElasticdFolder), 0700) && base::MakeFolders(between, 0711) &&
         stat(between.c_str(), &status) == 0 && chmod(between.c_str(), (status.st_mode & 07777) | 0111) == 0 &&
         base::MakeFolders(indices, 0700);
}

/// The list of indices goes last: it makes the user known.
void Prepare(const EngineIds& to) {
  FERROX_FAIL_IF(geteuid() != 0 || !services::IsRootsInstance(), Error::kInternal,
                 "only root can give the engine a user of its own, and in an instance of root's");
  const std::optional<EngineIds> known = services::EngineUser();
  services::ClosePrivateFolders();
  const bool made = MakeFoldersForUser() && MakeSocketLink() &&
                    services::GiveOwnFolder(InstancePath(kElasticdRunFolder), 0755, to) &&
                    services::GivePidFile("kovaelasticd", to);
  FERROX_FAIL_IF(!made, Error::kInternal, "the folders of the engine's user cannot be made: " + ErrnoText());
  const bool given = GiveIndices(to);
  FERROX_FAIL_IF(!given, Error::kInternal,
                 "the indices in " + InstancePath(kIndexFolder) +
                     " cannot be given to the engine's user: it, and each folder above it, must be root's, and "
                     "nobody else's to change");
  if (!known.has_value()) GiveOtherIndices(to);
  const bool is_list_given = GiveFolderAt(InstancePath(kElasticdFolder), to);
  const std::optional<EngineIds> now = services::EngineUser();
  FERROX_FAIL_IF(!is_list_given || !now.has_value() || now->uid != to.uid, Error::kInternal,
                 InstancePath(kElasticdFolder) + " is not the engine's: give it, and all in it, to user " +
                     std::to_string(to.uid) + ", and the folders above it to root");
  for (const char* socket : {kAccessSocket, kFileIndexdSocket, kNotifydSocket}) {
    if (access(InstancePath(socket).c_str(), F_OK) == 0) services::AdmitEngine(InstancePath(socket));
  }
}

}  // namespace

void PrepareForUser(const std::string& user) { Prepare(services::IdsOfAccount(user, "the engine")); }

void BecomeOwnUser() {
  const std::optional<EngineIds> own = services::EngineUser();
  if (geteuid() != 0 || !own.has_value()) return;
  Prepare(*own);
  services::BecomeUser(*own);
}

std::string OwnSocketPath() {
  const std::optional<EngineIds> own = services::EngineUser();
  return InstancePath(own.has_value() && own->uid == geteuid() ? kElasticdOwnSocket : kElasticdSocket);
}

}  // namespace ferrox::engine
