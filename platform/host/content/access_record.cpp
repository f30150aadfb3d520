#include "platform/host/content/access_record.h"

#include <sys/xattr.h>

#include <cerrno>
#include <chrono>
#include <cstddef>
#include <cstdint>
#include <optional>
#include <string_view>
#include <utility>
#include <vector>

#include <kova/content_extract.h>

#include "base/access_record.h"

namespace kova::content {

namespace {

using base::AclEntry;
using std::chrono::steady_clock;
using Acl = std::vector<AclEntry>;

constexpr char kAclName[] = "system.posix_acl_access";
constexpr size_t kUsualAclBytes = 1024;
constexpr size_t kAclBytesMax = 65536;  ///< the kernel's limit for an extended attribute

// The attribute's form: the version, then entries, all in little-endian byte order.
constexpr uint32_t kAclVersion = 2;
constexpr size_t kHeaderBytes = 4;
constexpr size_t kEntryBytes = 8;  ///< tag and permissions of 16 bits, id of 32
enum Tag : uint16_t { kOwner = 0x01, kUser = 0x02, kOwningGroup = 0x04, kGroup = 0x08, kMask = 0x10, kOther = 0x20 };

/// A file system without ACLs is asked again after this time: it may be mounted anew with them.
constexpr std::chrono::seconds kNoAclsRemembered{1};

uint32_t Number(std::string_view bytes, size_t at, size_t size) {
  uint32_t number = 0;
  for (size_t i = size; i-- > 0;) number = number << 8 | static_cast<unsigned char>(bytes[at + i]);
  return number;
}

/// The entries beyond owner, mask and others, which the mode has; none where that is all, nothing for what is no ACL.
std::optional<Acl> ReadEntries(std::string_view acl) {
  if (acl.size() < kHeaderBytes || (acl.size() - kHeaderBytes) % kEntryBytes != 0) return {};
  if (Number(acl, 0, 4) != kAclVersion) return {};
  Acl entries;
  bool is_extended = false;
  for (size_t at = kHeaderBytes; at < acl.size(); at += kEntryBytes) {
    const uint32_t tag = Number(acl, at, 2);
    const auto allowed = static_cast<uint8_t>(Number(acl, at + 2, 2));
    if (Number(acl, at + 2, 2) > 07) return {};
    if (tag == kOwner || tag == kOther) continue;
    is_extended = is_extended || tag != kOwningGroup;
    if (tag == kMask) continue;
    if (tag != kUser && tag != kOwningGroup && tag != kGroup) return {};
    if (tag == kOwningGroup) {
      entries.push_back({AclEntry::Kind::kOwningGroup, allowed, 0});
    } else {
      entries.push_back(
          {tag == kUser ? AclEntry::Kind::kUser : AclEntry::Kind::kGroup, allowed, Number(acl, at + 4, 4)});
    }
  }
  return is_extended ? entries : Acl();
}

/// The ACL of the file; empty where it has none, nothing when that cannot be found out.
std::optional<Acl> ReadAcl(const std::string& path, dev_t device) {
  thread_local dev_t without = 0;  // the last file system that has no ACLs
  thread_local steady_clock::time_point until;
  if (device == without && steady_clock::now() < until) return Acl();
  std::string acl(kUsualAclBytes, '\0');
  ssize_t size = lgetxattr(path.c_str(), kAclName, acl.data(), acl.size());
  if (size < 0 && errno == ERANGE) {
    acl.resize(kAclBytesMax);
    size = lgetxattr(path.c_str(), kAclName, acl.data(), acl.size());
  }
  if (size >= 0) return ReadEntries(std::string_view(acl).substr(0, static_cast<size_t>(size)));
  if (errno == ENODATA) return Acl();
  if (errno != ENOTSUP) return {};
  without = device;
  until = steady_clock::now() + kNoAclsRemembered;
  return Acl();
}

}  // namespace

/// What is neither a regular file nor a folder has nothing to read, and with an ACL that cannot be read nothing is
/// known: both count as what nobody may read.
std::string AccessRecord(const std::string& path, const Rights& rights) {
  const bool is_readable = S_ISREG(rights.mode) || S_ISDIR(rights.mode);
  std::optional<Acl> acl = is_readable ? ReadAcl(path, rights.device) : std::nullopt;
  const auto mode = static_cast<uint16_t>(acl.has_value() ? rights.mode & 07777U : 0);
  return base::AccessText({rights.owner, rights.group, mode, std::move(acl).value_or(Acl())});
}

std::string AccessRecord(const std::string& path) {
  struct stat status = {};
  return lstat(path.c_str(), &status) == 0 ? KOVA::CONTENT_EXTRACT::Access(path, status) : std::string();
}

}  // namespace kova::content

namespace KOVA::CONTENT_EXTRACT {

std::string Access(const std::string& path, const struct stat& status) {
  return kova::content::AccessRecord(path, {status.st_uid, status.st_gid, status.st_mode, status.st_dev});
}

}  // namespace KOVA::CONTENT_EXTRACT
