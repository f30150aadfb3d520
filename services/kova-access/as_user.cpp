#include "services/kova-access/as_user.h"

#include <linux/capability.h>
#include <sys/fsuid.h>
#include <sys/syscall.h>
#include <unistd.h>

#include <algorithm>
#include <exception>
#include <iterator>
#include <set>
#include <thread>

#include "common/error.h"
#include "common/log.h"

namespace ferrox::access {

namespace {

// The C library's functions of these names change the ids of all threads. Where the numbers end in 32, those without
// take ids of 16 bits.
#ifdef SYS_setgroups32
constexpr long kSetGroups = SYS_setgroups32, kSetGids = SYS_setresgid32, kSetUids = SYS_setresuid32;
#else
constexpr long kSetGroups = SYS_setgroups, kSetGids = SYS_setresgid, kSetUids = SYS_setresuid;
#endif

constexpr auto kUnchanged = static_cast<uid_t>(-1);

struct Capabilities {
  __user_cap_header_struct header = {_LINUX_CAPABILITY_VERSION_3, 0};  // 0: the calling thread
  __user_cap_data_struct data[_LINUX_CAPABILITY_U32S_3] = {};
};

/// The real and the saved uid stay the daemon's. Files are opened by the effective one alone, and a thread whose other
/// uids were the user's could be killed by that user, and with it the daemon.
bool TakeIds(const User& user) {
  const gid_t gid = user.groups.front();
  return syscall(kSetGroups, user.groups.size(), user.groups.data()) == 0 && syscall(kSetGids, gid, gid, gid) == 0 &&
         syscall(kSetUids, kUnchanged, user.uid, kUnchanged) == 0;
}

bool DropCapabilities() {
  Capabilities none;
  return syscall(SYS_capset, &none.header, none.data) == 0;
}

bool HasIds(const User& user) {
  uid_t uids[3] = {};
  gid_t gids[3] = {};
  if (getresuid(&uids[0], &uids[1], &uids[2]) != 0 || getresgid(&gids[0], &gids[1], &gids[2]) != 0) return false;
  const gid_t gid = user.groups.front();
  if (uids[1] != user.uid || std::any_of(std::begin(gids), std::end(gids), [gid](gid_t one) { return one != gid; })) {
    return false;
  }
  // A change to an id that does not exist tells the present one.
  return static_cast<uid_t>(setfsuid(kUnchanged)) == user.uid && static_cast<gid_t>(setfsgid(kUnchanged)) == gid;
}

bool HasGroups(const User& user) {
  std::vector<gid_t> groups(user.groups.size() + 1);
  const int count = getgroups(static_cast<int>(groups.size()), groups.data());
  if (count < 0) return false;
  groups.resize(static_cast<size_t>(count));
  return std::set<gid_t>(groups.begin(), groups.end()) == std::set<gid_t>(user.groups.begin(), user.groups.end());
}

/// Those that could be in effect now, or come into effect by a later call.
bool HasNoCapability() {
  Capabilities own;
  if (syscall(SYS_capget, &own.header, own.data) != 0) return false;
  return std::all_of(std::begin(own.data), std::end(own.data), [](const __user_cap_data_struct& one) {
    return one.effective == 0 && one.permitted == 0 && one.inheritable == 0;
  });
}

void BecomeUser(const User& user) {
  FERROX_FAIL_IF(user.groups.empty(), Error::kEngineRightsUnknown, "the user has no group");
  FERROX_FAIL_IF(!TakeIds(user) || !DropCapabilities(), Error::kEngineRightsUnknown,
                 "kova-access cannot take on the ids of a user");
  FERROX_FAIL_IF(!HasIds(user) || !HasGroups(user) || !HasNoCapability(), Error::kEngineRightsUnknown,
                 "kova-access did not get the ids of a user");
}

}  // namespace

void RunAsUser(const User& user, const std::function<void()>& work) {
  std::exception_ptr failure;
  std::thread thread([&] {
    try {
      BecomeUser(user);
      work();
    } catch (...) {
      failure = std::current_exception();
    }
  });
  thread.join();
  if (failure) std::rethrow_exception(failure);
}

}  // namespace ferrox::access
