#include "services/support/engine_user.h"

#include <endian.h>
#include <sys/xattr.h>
#include <syslog.h>

#include <cerrno>
#include <cstdint>

#include "common/file_util.h"
#include "common/log.h"
#include "common/paths.h"
#include "services/support/instance_owner.h"

namespace ferrox::services {

namespace {

/// The kernel's form of an ACL: the version, then entries in this order, all in little-endian byte order.
struct SocketAcl {
  struct Entry {
    uint16_t tag, permissions;
    uint32_t id;
  };
  uint32_t version;
  Entry entries[5];
};
static_assert(sizeof(SocketAcl) == 4 + 5 * 8);

/// Read and write for the owner and for `uid`, nothing for all others.
SocketAcl AclFor(uid_t uid) {
  enum Tag : uint16_t { kOwner = 0x01, kUser = 0x02, kOwningGroup = 0x04, kMask = 0x10, kOther = 0x20 };
  constexpr uint16_t kReadWrite = 6;
  constexpr uint32_t kNoId = UINT32_MAX;
  const auto entry = [](Tag tag, uint16_t permissions, uint32_t id) {
    return SocketAcl::Entry{htole16(tag), htole16(permissions), htole32(id)};
  };
  return {htole32(2),
          {entry(kOwner, kReadWrite, kNoId), entry(kUser, kReadWrite, uid), entry(kOwningGroup, 0, kNoId),
           entry(kMask, kReadWrite, kNoId), entry(kOther, 0, kNoId)}};
}

bool IsRootsAlone(const char* folder) {
  struct stat status = {};
  return stat(InstancePath(folder).c_str(), &status) == 0 && status.st_uid == 0 && !MayOthersWrite(status);
}

}  // namespace

bool MayOthersWrite(const struct stat& status) { return (status.st_mode & 022) != 0; }

std::optional<EngineIds> UserOfFolder(const char* folder) {
  if (!IsRootsInstance()) return {};
  for (const char* above : {"/var", "/var/lib", "/var/lib/kova"}) {
    if (!IsRootsAlone(above)) return {};
  }
  struct stat status = {};
  const bool is_own = lstat(InstancePath(folder).c_str(), &status) == 0 && S_ISDIR(status.st_mode) &&
                      status.st_uid != 0 && (status.st_mode & 077) == 0;
  return is_own ? std::optional(EngineIds{status.st_uid, status.st_gid}) : std::nullopt;
}

std::optional<EngineIds> EngineUser() { return UserOfFolder(kElasticdFolder); }

void AdmitEngine(const std::string& path) {
  const std::optional<EngineIds> engine = EngineUser();
  if (!engine.has_value()) return;
  const SocketAcl acl = AclFor(engine->uid);
  if (setxattr(path.c_str(), "system.posix_acl_access", &acl, sizeof(acl), 0) != 0) {
    Log(LOG_WARNING, "the search engine cannot ask at %s: its ACL cannot be set: %s", path.c_str(),
        ErrnoText().c_str());
  }
}

bool IsEngine(const Peer& peer) {
  const std::optional<EngineIds> engine = EngineUser();
  return engine.has_value() && engine->uid == peer.uid;
}

}  // namespace ferrox::services
