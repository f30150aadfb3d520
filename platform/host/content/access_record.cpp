#include "platform/host/content/access_record.h"

#include <sys/xattr.h>

#include <cerrno>
#include <chrono>
#include <cstddef>
#include <cstdint>
#include <cstdio>
#include <optional>
#include <string_view>

#include <kova/content_extract.h>

namespace kova::content {

namespace {

using std::chrono::steady_clock;

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

/// The entries beyond owner, mask and others, which the mode has; "" where there are none, nothing for what is no ACL.
std::optional<std::string> AclText(std::string_view acl) {
  if (acl.size() < kHeaderBytes || (acl.size() - kHeaderBytes) % kEntryBytes != 0) return {};
  if (Number(acl, 0, 4) != kAclVersion) return {};
  std::string text;
  bool is_extended = false;
  for (size_t at = kHeaderBytes; at < acl.size(); at += kEntryBytes) {
    const uint32_t tag = Number(acl, at, 2);
    const uint32_t allowed = Number(acl, at + 2, 2);
    if (allowed > 07) return {};
    if (tag == kOwner || tag == kOther) continue;
    is_extended = is_extended || tag != kOwningGroup;
    if (tag == kMask) continue;
    if (tag != kUser && tag != kOwningGroup && tag != kGroup) return {};
    text += std::string(text.empty() ? "" : ",") + (tag == kUser ? "u" : "g");
    if (tag != kOwningGroup) text += std::to_string(Number(acl, at + 4, 4));
    text += "=" + std::to_string(allowed);
  }
  return is_extended ? text : "";
}

/// The ACL of the file; "" where it has none, nothing when that cannot be found out.
std::optional<std::string> ReadAcl(const std::string& path, dev_t device) {
  thread_local dev_t without = 0;  // the last file system that has no ACLs
  thread_local steady_clock::time_point until;
  if (device == without && steady_clock::now() < until) return "";
  std::string acl(kUsualAclBytes, '\0');
  ssize_t size = lgetxattr(path.c_str(), kAclName, acl.data(), acl.size());
  if (size < 0 && errno == ERANGE) {
    acl.resize(kAclBytesMax);
    size = lgetxattr(path.c_str(), kAclName, acl.data(), acl.size());
  }
  if (size >= 0) return AclText(std::string_view(acl).substr(0, static_cast<size_t>(size)));
  if (errno == ENODATA) return "";
  if (errno != ENOTSUP) return {};
  without = device;
  until = steady_clock::now() + kNoAclsRemembered;
  return "";
}

}  // namespace

/// What is neither a regular file nor a folder has nothing to read, and with an ACL that cannot be read nothing is
/// known: both count as what nobody may read.
std::string AccessRecord(const std::string& path, const Rights& rights) {
  const bool is_readable = S_ISREG(rights.mode) || S_ISDIR(rights.mode);
  const std::optional<std::string> acl = is_readable ? ReadAcl(path, rights.device) : std::nullopt;
  char text[48];
  (void)snprintf(text, sizeof(text), "%ju:%ju:%04o", static_cast<uintmax_t>(rights.owner),
                 static_cast<uintmax_t>(rights.group), acl.has_value() ? rights.mode & 07777U : 0);
  return acl.value_or("").empty() ? text : text + (":" + *acl);
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
