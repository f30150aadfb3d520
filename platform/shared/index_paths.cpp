#include "platform/shared/index_paths.h"

#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>
#include <cinttypes>
#include <cstdint>
#include <cstdio>

#include <kova/instance.h>

#include "base/files.h"
#include "base/path.h"
#include "platform/shared/failure.h"

namespace kova {

namespace {

constexpr size_t kEscapedMaxBytes = 200;
constexpr size_t kKeptOfLongBytes = 160;
constexpr char kStateFolder[] = "/var/lib/kova/fileindex";

bool IsPlain(unsigned char c) {
  return (c >= 'a' && c <= 'z') || (c >= 'A' && c <= 'Z') || (c >= '0' && c <= '9') || c == '_' || c == '-' || c == '.';
}

uint64_t Hash(const std::string& text, uint64_t value) {
  for (const unsigned char c : text) value = (value ^ c) * UINT64_C(0x100000001b3);
  value = (value ^ (value >> 30)) * UINT64_C(0xbf58476d1ce4e5b9);
  value = (value ^ (value >> 27)) * UINT64_C(0x94d049bb133111eb);
  return value ^ (value >> 31);
}

std::string WithoutTrailingSlashes(std::string path) {
  while (!path.empty() && path.back() == '/') path.pop_back();
  return path;
}

std::string Compose(const std::string& share_path, const char* folder_name, const char* suffix) {
  const std::string path = WithoutTrailingSlashes(share_path);
  if (path.empty() || path.front() != '/') {
    (void)KOVA_FAIL(KOVA_ERR_BAD_PARAMETER);
    return {};
  }
  const std::string state = InstanceRoot() + kStateFolder;
  const std::string folder = state + "/" + folder_name;
  struct stat info = {};
  const bool is_there = stat(folder.c_str(), &info) == 0;
  // A user who can open a lock file in the folder could hold its lock, and keep the daemons out.
  if (is_there && (info.st_mode & 077) != 0 && info.st_uid == geteuid()) (void)chmod(folder.c_str(), 0700);
  const bool made = is_there || (base::MakeFolders(base::FolderOf(state)) && base::MakeFolders(folder, 0700));
  if (!made) {
    (void)KOVA_FAIL_ERRNO();
    return {};
  }
  return folder + "/" + EscapeSharePath(path) + suffix;
}

}  // namespace

std::string EscapeSharePath(const std::string& share_path) {
  const std::string path = WithoutTrailingSlashes(share_path);
  std::string escaped;
  for (size_t i = 0; i < path.size(); ++i) {
    const auto c = static_cast<unsigned char>(path[i]);
    if (c == '/') {
      if (i > 0) escaped += '+';
    } else if (IsPlain(c) && (c != '.' || !escaped.empty())) {
      escaped += path[i];
    } else {
      char hex[4];
      (void)snprintf(hex, sizeof(hex), "%%%02X", c);
      escaped += hex;
    }
  }
  if (escaped.size() <= kEscapedMaxBytes) return escaped;
  char hash[40];
  (void)snprintf(hash, sizeof(hash), "~%016" PRIx64 "%016" PRIx64, Hash(path, UINT64_C(0xcbf29ce484222325)),
                 Hash(path, UINT64_C(0x9e3779b97f4a7c15)));
  return escaped.substr(0, kKeptOfLongBytes) + hash;
}

std::string ComposeQueuePath(const std::string& share_path) { return Compose(share_path, "queue", ".queue"); }

std::string ComposeDBPath(const std::string& share_path) { return Compose(share_path, "db", ".index"); }

}  // namespace kova
