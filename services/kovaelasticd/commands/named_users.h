#pragma once

#include <chrono>
#include <cstdint>
#include <functional>
#include <map>
#include <memory>
#include <optional>
#include <string>
#include <vector>

#include <json/value.h>

#include "base/mutex.h"
#include "wire/trust.h"

namespace ferrox::engine {

/// Whether a name of a share's rules means a user. kUnknown: the name service does not tell.
enum class Meant : uint8_t { kNo, kYes, kUnknown };

/// A user for whom a request asks by name, as the name service knows that user.
struct NamedUser {
  uint32_t uid = 0;
  std::vector<uint32_t> groups = {};                           ///< each once, in ascending order; at least one
  std::shared_ptr<const std::vector<std::string>> names = {};  ///< of rules, in ascending order; shared by all users
  std::vector<Meant> meant = {};                               ///< for each of `names`

  Meant IsMeantBy(const std::string& name) const;
};
using NamedUserPtr = std::shared_ptr<const NamedUser>;

/// Who may ask for users by name, and for whom.
using wire::Trust;

/// Where the engine learns of users. Any thread calls these.
struct UserSources {
  /// The settings of now. It is called where connections are taken, and must not block for longer than now and then.
  std::function<Trust()> trust = [] { return Trust(); };
  /// What `kova-accounts` writes for the arguments; nothing when it fails. Blocks for some seconds at most.
  std::function<std::optional<std::string>(const std::vector<std::string>& arguments)> look_up = [](const auto&) {
    return std::nullopt;
  };
};

/// Looks users up and remembers them for a minute. A name service that does not answer holds two threads at most, and
/// each only until the look-up's deadline.
class NamedUsers {
 public:
  NamedUsers(UserSources sources, uint32_t instance_owner)
      : sources_(std::move(sources)), instance_owner_(instance_owner) {}

  /// Whether the user's programs may ask for others.
  bool IsTrusted(uint32_t uid) const;
  /// The user that `user` names or numbers, and which of `names`, in ascending order, mean that user.
  /// @throws Error kEngineBadRequest; kEngineNotPermitted for one who may not be asked for; kEngineUserBusy when it
  /// cannot be told now.
  NamedUserPtr Find(const Json::Value& user, std::vector<std::string> names);

  /// One request at work for a user, while it lives. @throws Error kEngineUserBusy when there are two already.
  class Turn {
   public:
    Turn(NamedUsers& users, uint32_t uid);
    Turn(const Turn&) = delete;
    Turn& operator=(const Turn&) = delete;
    ~Turn();

   private:
    NamedUsers& users_;
    const uint32_t uid_;
  };

 private:
  using Clock = std::chrono::steady_clock;
  struct Account {
    NamedUser user;
    bool may_log_in = false;  ///< also false when there is no such account
  };
  using AccountPtr = std::shared_ptr<const Account>;
  struct Kept {
    AccountPtr account;  ///< null: the look-up failed
    Clock::time_point until;
  };

  static AccountPtr ReadAccount(const std::string& text, std::shared_ptr<const std::vector<std::string>> names);
  AccountPtr LookUp(const std::vector<std::string>& key, std::shared_ptr<const std::vector<std::string>> names);
  void Keep(const std::vector<std::string>& key, AccountPtr account) BASE_REQUIRES(mutex_);

  const UserSources sources_;
  const uint32_t instance_owner_;
  base::Mutex mutex_;
  std::map<std::vector<std::string>, Kept> kept_ BASE_GUARDED_BY(mutex_);          ///< by the look-up's first arguments
  std::shared_ptr<const std::vector<std::string>> names_ BASE_GUARDED_BY(mutex_);  ///< of the last look-up
  unsigned look_ups_ BASE_GUARDED_BY(mutex_) = 0;                                  ///< under way
  std::map<uint32_t, unsigned> at_work_ BASE_GUARDED_BY(mutex_);
};

}  // namespace ferrox::engine
