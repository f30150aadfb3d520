#include "cli/rights.h"

#include <fcntl.h>
#include <pwd.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>
#include <cstdio>
#include <cstring>

#include <kova/instance.h>

#include "cli/caller.h"
#include "cli/output.h"
#include "common/file_util.h"
#include "common/paths.h"
#include "platform/host/share_table.h"

namespace ferrox::cli {

namespace {

/// Whether an errno value says that the caller lacks a right.
bool IsDenial(int error) { return error == EACCES || error == EPERM; }

/// Whether the caller is denied the access; no when there is nothing to access, or another reason against it.
bool IsDenied(const std::string& path, int mode) {
  return faccessat(AT_FDCWD, path.c_str(), mode, AT_EACCESS) != 0 && IsDenial(errno);
}

/// For several threads: 'status' asks the daemons at once, and each may refuse.
std::string UserName(uid_t uid) {
  passwd entry = {};
  passwd* user = nullptr;
  char names[16384];
  const int problem = getpwuid_r(uid, &entry, names, sizeof(names), &user);
  return problem == 0 && user != nullptr ? user->pw_name : std::to_string(uid);
}

/// The path, or the deepest folder above it for which the predicate holds; "/" at the latest.
template <typename Predicate>
std::string FirstUpwards(std::string path, const Predicate& holds) {
  while (!holds(path) && path.size() > 1) {
    path = Dirname(path);
    if (path.empty()) path = "/";
  }
  return path;
}

/// Of the path, or of the deepest folder above it that the caller can see: what lies behind a folder that may not be
/// entered belongs, as far as is known, to that folder's owner.
uid_t OwnerOf(const std::string& path) {
  struct stat status = {};
  (void)FirstUpwards(path, [&status](const std::string& place) { return stat(place.c_str(), &status) == 0; });
  return status.st_uid;
}

/// The folder itself, or the deepest one above it that is there: where it would be made.
std::string PlaceOf(const std::string& folder) {
  struct stat status = {};
  return FirstUpwards(
      folder, [&status](const std::string& place) { return stat(place.c_str(), &status) == 0 || errno != ENOENT; });
}

}  // namespace

/// The remedy is the command line that works: as root, or as the owner of what was denied.
NotPermitted MayNot(const std::string& act, const std::string& path) {
  const std::string owner = UserName(OwnerOf(path));
  const std::string& root = kova::InstanceRoot();
  const std::string command = std::string("sudo") + (owner == "root" ? "" : " -u " + owner) + " fileindexctl" +
                              (root.empty() ? "" : " --root " + root);  // sudo drops FERROX_ROOT
  return NotPermitted("user " + UserName(geteuid()) + " may not " + act + " " + path + ", which belongs to " + owner +
                      "; run '" + command +
                      "' with the same command, or work on an instance of your own ('--root' with a folder that you "
                      "may write)");
}

NotPermitted MayNotConnect(const std::string& socket) {
  const std::string refusal = MayNot("use", socket).what();
  if (IsPrivileged() || OwnerOf(socket) != 0) return NotPermitted(refusal);
  struct stat status = {};
  const bool is_seen = stat(socket.c_str(), &status) == 0;
  return NotPermitted(refusal + "; for users to search, its administrator " +
                      (is_seen ? "restarts a search engine of an earlier version ('fileindexctl down', 'up')"
                               : "lets them enter the folders above it"));
}

void RequireShareTable(Needs needs) {
  const std::string problem = kova::host::ShareTable::Load(kova::host::ShareTablePath()).Problem();
  if (problem.empty()) return;
  if (needs == Needs::kAnswers || needs == Needs::kShares) throw Failure(problem);
  Warn(problem);
}

/// Asks for the files and folders themselves with the effective identity; what the daemons permit, they say themselves.
void RequireRights(Needs needs) {
  if (needs >= Needs::kReading) {
    for (const std::string& file : {kova::host::ShareTablePath(), kova::InstanceRoot() + "/etc/kova/kova.json",
                                    InstancePath(kFileIndexFoldersCfgPath), InstancePath(kFileIndexStatusCfgPath)}) {
      if (IsDenied(file, R_OK)) throw MayNot("read", file);
    }
  }
  if (needs >= Needs::kService) {
    const std::string folder = PlaceOf(InstancePath(kConfigurationFolder));
    if (IsDenied(folder, W_OK | X_OK)) throw MayNot("change", folder);
  }
}

void RequireReadable(const std::string& folder) {
  if (IsDenied(folder, R_OK | X_OK)) throw MayNot("read", folder);
}

void ThrowSystemFailure(int error, const std::string& act, const std::string& path, const std::string& remedy) {
  if (IsDenial(error)) throw MayNot(act, path);
  throw Failure("cannot " + act + " " + path + ": " + strerror(error) + remedy);
}

}  // namespace ferrox::cli
