#include <unistd.h>

#include <filesystem>

#include <kova/fs.h>

#include "base/path.h"
#include "platform/shared/failure.h"
#include "tests/support/fake_platform.h"

using ferrox::test::FakeCallFails;
using ferrox::test::FakePlatform;

int KOVAGetFSType(const char* path, int follow_mount) {
  if (FakeCallFails(__func__, std::string(path) + ", " + std::to_string(follow_mount))) return -1;
  int type = KOVA_FS_EXT;
  size_t best = 0;
  for (const auto& [prefix, code] : FakePlatform::Get().fs_types) {
    if (prefix.size() < best || !base::IsAtOrBelow(path, prefix)) continue;
    best = prefix.size();
    type = code;
  }
  return type;
}

int KOVAFSDirIsMntPoint(const char* path) {
  if (FakeCallFails(__func__, path)) return -1;
  return static_cast<int>(FakePlatform::Get().mount_points.count(path));
}

int KLIBFhsPathInSnapshot(const char* path, int* in_snapshot) {
  if (FakeCallFails(__func__, path)) return -1;
  *in_snapshot = 0;
  for (const std::string& folder : FakePlatform::Get().snapshots) {
    if (base::IsAtOrBelow(path, folder)) *in_snapshot = 1;
  }
  return 0;
}

int KOVAACLPermGet(const char* path) {
  if (FakeCallFails(__func__, path)) return -1;
  const auto found = FakePlatform::Get().permissions.find(path);
  if (found != FakePlatform::Get().permissions.end()) return found->second;
  if (access(path, F_OK) != 0) return KOVA_FAIL_ERRNO();
  int mask = 0;
  for (const int permission : {KOVA_PERM_READ, KOVA_PERM_WRITE, KOVA_PERM_EXECUTE}) {
    if (access(path, permission) == 0) mask |= permission;
  }
  return mask;
}

int KOVAFileCopy(const char* src, const char* dst, const KOVAFileCopyOptions* options, int flag) {
  if (FakeCallFails(__func__, std::string(src) + ", " + dst + ", " + std::to_string(options->words[0]) +
                                  std::to_string(options->words[1]) + ", " + std::to_string(flag))) {
    return -1;
  }
  namespace fs = std::filesystem;
  std::error_code error;
  if (options->words[0] != 1 && fs::exists(fs::symlink_status(dst, error))) return KOVA_FAIL(KOVA_ERR_SYSTEM);
  if (options->words[1] == 1) {
    fs::rename(src, dst, error);
  } else {
    (void)fs::copy_file(src, dst, fs::copy_options::overwrite_existing, error);
  }
  return error ? KOVA_FAIL(KOVA_ERR_SYSTEM) : 0;
}
