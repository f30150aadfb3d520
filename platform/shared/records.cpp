#include "platform/shared/records.h"

#include <atomic>
#include <cstdlib>
#include <cstring>

#include "platform/shared/failure.h"

namespace kova {

namespace {

std::atomic<int> g_live_records{0};

}  // namespace

KOVAShare* NewShare(const std::string& name, const std::string& path, uint32_t ftp_privilege, uint32_t flags) {
  ++g_live_records;
  return new KOVAShare{strdup(name.c_str()), strdup(path.c_str()), ftp_privilege, flags};
}

KOVAUser* NewUser(const std::string& name, uint32_t uid, uint32_t gid, const std::string& home) {
  ++g_live_records;
  return new KOVAUser{strdup(name.c_str()), uid, gid, strdup(home.c_str())};
}

int LiveRecords() { return g_live_records; }

bool CopyOut(const std::string& text, char* buffer, size_t size) {
  if (buffer == nullptr || text.size() >= size) {
    (void)KOVA_FAIL(KOVA_ERR_BAD_PARAMETER);
    return false;
  }
  memcpy(buffer, text.c_str(), text.size() + 1);
  return true;
}

}  // namespace kova

void KOVAShareFree(KOVAShare* share) {
  if (share == nullptr) return;
  free(share->name);
  free(share->path);
  delete share;
  --kova::g_live_records;
}

void KOVAUserFree(KOVAUser* user) {
  if (user == nullptr) return;
  free(user->name);
  free(user->home);
  delete user;
  --kova::g_live_records;
}
