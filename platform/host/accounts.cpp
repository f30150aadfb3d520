#include "platform/host/accounts.h"

#include <grp.h>
#include <pwd.h>

#include <cerrno>

#include "platform/shared/failure.h"

namespace kova::host {

namespace {

constexpr size_t kRecordMaxBytes = 1 << 20;

/// Calls one of the name service's functions, with a larger buffer as long as it asks for one. 0 or its error number.
template <typename Call>
int WithBuffer(std::vector<char>& buffer, Call call) {
  buffer.resize(4096);
  for (;;) {
    const int error = call();
    if (error == ERANGE && buffer.size() < kRecordMaxBytes) {
      buffer.resize(buffer.size() * 4);
    } else if (error != EINTR) {
      return error;
    }
  }
}

bool Take(int error, const passwd* record, Account& account) {
  if (record == nullptr) {
    // Some name services report an unknown name as one of these errors.
    const bool unknown = error == 0 || error == ENOENT || error == ESRCH || error == EBADF || error == EPERM;
    errno = error;
    (void)KOVA_FAIL(unknown ? KOVA_ERR_NO_SUCH_USER : KOVA_ERR_SYSTEM);
    return false;
  }
  account = {record->pw_name, record->pw_uid, record->pw_gid, record->pw_dir};
  return true;
}

}  // namespace

bool FindAccount(const std::string& name, Account& account) {
  std::vector<char> buffer;
  passwd record = {};
  passwd* found = nullptr;
  const int error =
      WithBuffer(buffer, [&] { return getpwnam_r(name.c_str(), &record, buffer.data(), buffer.size(), &found); });
  return Take(error, found, account);
}

bool FindAccount(uid_t uid, Account& account) {
  std::vector<char> buffer;
  passwd record = {};
  passwd* found = nullptr;
  const int error = WithBuffer(buffer, [&] { return getpwuid_r(uid, &record, buffer.data(), buffer.size(), &found); });
  return Take(error, found, account);
}

std::vector<gid_t> GroupsOf(const Account& account) {
  std::vector<gid_t> groups(64);
  for (;;) {
    auto count = static_cast<int>(groups.size());
    const int result = getgrouplist(account.name.c_str(), account.gid, groups.data(), &count);
    const bool too_small = result < 0 && count > static_cast<int>(groups.size());
    groups.resize(static_cast<size_t>(count));
    if (!too_small) return groups;
  }
}

bool FindGroup(const std::string& name, gid_t& gid) {
  std::vector<char> buffer;
  group record = {};
  group* found = nullptr;
  (void)WithBuffer(buffer, [&] { return getgrnam_r(name.c_str(), &record, buffer.data(), buffer.size(), &found); });
  if (found == nullptr) return false;
  gid = found->gr_gid;
  return true;
}

}  // namespace kova::host
