#pragma once

#include <sys/types.h>

#include <string>

#include "common/export.h"

namespace ferrox::sdk {

/// Remembers the process's effective user and group and gives them back when the scope ends. The identity is that of
/// the whole process, not of one thread: files that other threads open meanwhile are opened as that user, too. Keep the
/// scope short, and have one at a time. Each call asks the platform under SDKMutex() (common/sdk_mutex.h), which the
/// caller must not hold; that may block for as long as the host's user database does.
///   {
///     const ferrox::sdk::SDKCredentials as_user("ann");
///     readable = CheckACLPerm(path, KOVA_PERM_READ);
///   }  // the process is itself again
class FERROX_EXPORT SDKCredentials {
 public:
  /// Remembers only. @throws Error kCredentialsFailed when the present user is unknown to the platform.
  SDKCredentials();
  /// Remembers, then AsUser(user).
  explicit SDKCredentials(const std::string& user);
  SDKCredentials(const SDKCredentials&) = delete;
  SDKCredentials& operator=(const SDKCredentials&) = delete;
  /// Restores the identity if it has changed. @throws Error kCredentialsFailed when that fails: going on under a
  /// foreign identity would be worse. Only logs while another exception is leaving the scope.
  ~SDKCredentials() noexcept(false);

  /// Becomes `user`, or "root" when `user` is an administrator. May be called again for another user.
  /// @throws Error kCredentialsFailed when the user is unknown or the switch fails; the identity is then as before.
  void AsUser(const std::string& user);

 private:
  uid_t uid_;  ///< the effective ids to go back to
  gid_t gid_;
  std::string username_;      ///< of uid_: the platform changes the identity by name
  int exceptions_in_flight_;  ///< at construction; more of them at the end mean that one is leaving the scope
};

}  // namespace ferrox::sdk
