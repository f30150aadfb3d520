#include "sdk/credentials.h"

#include <unistd.h>

#include <cerrno>
#include <exception>
#include <memory>

#include <kova/error.h>
#include <kova/user.h>

#include "common/log.h"
#include "common/sdk_mutex.h"

namespace ferrox::sdk {

SDKCredentials::SDKCredentials() : uid_(geteuid()), gid_(getegid()), exceptions_in_flight_(std::uncaught_exceptions()) {
  const LockMutex guard(SDKMutex());
  KOVAUser* found = nullptr;
  const int result = KOVAUserGetByUID(uid_, &found);
  const std::unique_ptr<KOVAUser, decltype(&KOVAUserFree)> user(found, &KOVAUserFree);
  FERROX_FAIL_IF_AS(0 > result || !user, "0 > KOVAUserGetByUID(uid_, &user) || !user", Error::kCredentialsFailed,
                    "KOVAUserGetByUID failed, err=" + std::to_string(KLIBCErrGet()));
  username_ = user->name;
}

// The object is complete once it remembers the identity: a switch that fails halfway is undone by the destructor.
SDKCredentials::SDKCredentials(const std::string& user) : SDKCredentials() { AsUser(user); }

SDKCredentials::~SDKCredentials() noexcept(false) {
  if (geteuid() == uid_ && getegid() == gid_) return;
  const LockMutex guard(SDKMutex());
  if (ResetCredentialsByName(username_.c_str(), true)) return;
  LogFailure({FERROX_SOURCE, __LINE__, __func__, "!ResetCredentialsByName(username_)"}, errno);
  // While another exception is on its way a second one would end the process; that one already tells of a failure.
  if (std::uncaught_exceptions() > exceptions_in_flight_) return;
  throw Error(Error::kCredentialsFailed);
}

void SDKCredentials::AsUser(const std::string& user) {
  const LockMutex guard(SDKMutex());
  const std::string target = KLIBGroupIsAdminGroupMem(user.c_str(), 0) == 1 ? "root" : user;
  FERROX_FAIL_IF_AS(!ResetCredentialsByName(target.c_str(), true), "!ResetCredentialsByName(target_username)",
                    Error::kCredentialsFailed);
}

}  // namespace ferrox::sdk
