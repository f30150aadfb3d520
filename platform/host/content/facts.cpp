#include "platform/host/content/facts.h"

#include <fcntl.h>
#include <sys/sysmacros.h>

#include <algorithm>
#include <cerrno>
#include <cstring>
#include <stdexcept>

#include "base/file_stamp.h"
#include "base/text.h"
#include "platform/host/content/access_record.h"
#include "wire/fields.h"

namespace kova::content {

namespace {

namespace field = ferrox::fileindex::elastic;

constexpr uint64_t kBlockBytes = 512;

/// The text after the last "." of the name, in lower case.
std::string ExtensionOf(const std::string& name) {
  const size_t dot = name.rfind('.');
  if (dot == std::string::npos) return {};
  return base::LowerAscii(name.substr(dot + 1));
}

Rights RightsOf(const struct statx& info) {
  return {info.stx_uid, info.stx_gid, info.stx_mode, makedev(info.stx_dev_major, info.stx_dev_minor)};
}

std::string Stamp(const struct statx& info) {
  using base::FileStamp;
  return FileStamp{info.stx_size, FileStamp::Nanoseconds(info.stx_mtime.tv_sec, info.stx_mtime.tv_nsec),
                   FileStamp::Nanoseconds(info.stx_ctime.tv_sec, info.stx_ctime.tv_nsec), info.stx_ino}
      .Text();
}

void AddSizesAndDates(const struct statx& info, Json::Value& document) {
  document[field::kKOVAMDFSSize] = static_cast<Json::UInt64>(info.stx_size);
  document[field::kKOVAMDLogicalSize] = static_cast<Json::UInt64>(info.stx_size);
  document[field::kKOVAMDPhysicalSize] = static_cast<Json::UInt64>(info.stx_blocks * kBlockBytes);
  document[field::kKOVAMDFSContentChangeDate] = static_cast<Json::Int64>(info.stx_mtime.tv_sec);
  document[field::kKOVAMDContentModificationDate] = static_cast<Json::Int64>(info.stx_mtime.tv_sec);
  document[field::kKOVAMDAttributeChangeDate] = static_cast<Json::Int64>(info.stx_ctime.tv_sec);
  if ((info.stx_mask & STATX_BTIME) != 0 && info.stx_btime.tv_sec != 0) {  // 0: made by an image builder, not known
    document[field::kKOVAMDFSCreationDate] = static_cast<Json::Int64>(info.stx_btime.tv_sec);
  }
}

}  // namespace

const char* TypeByMode(unsigned mode) {
  switch (mode & S_IFMT) {
    case S_IFDIR:
      return "inode/directory";
    case S_IFLNK:
      return "inode/symlink";
    case S_IFIFO:
      return "inode/fifo";
    case S_IFSOCK:
      return "inode/socket";
    case S_IFCHR:
      return "inode/chardevice";
    case S_IFBLK:
      return "inode/blockdevice";
    default:
      return nullptr;
  }
}

Facts AddFacts(const std::string& path, Json::Value& document) {
  Facts facts;
  constexpr unsigned kWanted = STATX_BASIC_STATS | STATX_BTIME;
  if (statx(AT_FDCWD, path.c_str(), AT_SYMLINK_NOFOLLOW | AT_NO_AUTOMOUNT, kWanted, &facts.info) != 0) {
    throw std::runtime_error("cannot examine " + path + ": " + strerror(errno));
  }
  const size_t slash = path.rfind('/');
  const std::string name = path.substr(slash + 1);
  facts.extension = ExtensionOf(name);
  facts.access = AccessRecord(path, RightsOf(facts.info));
  document = Json::Value(Json::objectValue);
  document[field::kKOVAMDPath] = path;
  document[field::kKOVAMDParent] = slash == std::string::npos ? std::string() : path.substr(0, slash);
  document[field::kKOVAMDFSName] = name;
  document[field::kKOVAMDDisplayName] = name;
  document[field::kKOVAMDKind] = facts.extension;
  document[field::kKOVAMDExtension] = facts.extension;
  document[field::kKOVAMDIsDir] = S_ISDIR(facts.info.stx_mode);
  document[field::kKOVAMDOwnerUserID] = std::to_string(facts.info.stx_uid);
  document[field::kKOVAMDOwnerGroupID] = std::to_string(facts.info.stx_gid);
  document[field::k_KOVAStamp] = Stamp(facts.info);
  document[field::k_KOVAAccess] = facts.access;
  AddSizesAndDates(facts.info, document);
  return facts;
}

}  // namespace kova::content
