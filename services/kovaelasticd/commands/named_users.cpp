#include "services/kovaelasticd/commands/named_users.h"

#include <algorithm>
#include <utility>

#include "base/scope_exit.h"
#include "common/json_util.h"
#include "services/kovaelasticd/commands/members.h"
#include "services/kovaelasticd/commands/user_error.h"

namespace ferrox::engine {

namespace {

constexpr std::chrono::seconds kKeepFound{60};
constexpr std::chrono::seconds kKeepFailed{5};
constexpr size_t kKeptMax = 1000;
constexpr unsigned kLookUpsMax = 2;
constexpr unsigned kTurnsOfNamed = 2;
constexpr size_t kUserNameMax = 255;
/// Fewer than the kernel's, so that what is kept stays small.
constexpr unsigned kGroupsKept = 4096;

/// The arguments that stand for the user.
std::vector<std::string> UserArguments(const Json::Value& user) {
  if (user.isUInt()) return {"uid", std::to_string(user.asUInt())};
  const std::string name = user.isString() ? user.asString() : "";
  const bool control = std::any_of(name.begin(), name.end(), [](unsigned char c) { return c < 0x20 || c == 0x7f; });
  if (name.empty() || name.size() > kUserNameMax || control) RefuseMember("user", "the name or number of a user");
  return {"name", name};
}

std::optional<Meant> ReadMeant(const Json::Value& text) {
  if (text == "yes") return Meant::kYes;
  if (text == "no") return Meant::kNo;
  if (text == "unknown") return Meant::kUnknown;
  return std::nullopt;
}

bool ReadNamedUser(const Json::Value& told, NamedUser& user) {
  const Json::Value& groups = told["gids"];
  const Json::Value& rules = told["rules"];
  const bool shaped = told["uid"].isUInt() && groups.isArray() && !groups.empty() && groups.size() <= kGroupsKept &&
                      rules.isArray() && rules.size() == user.names->size();
  if (!shaped) return false;
  user.uid = told["uid"].asUInt();
  for (const Json::Value& group : groups) {
    if (!group.isUInt()) return false;
    user.groups.push_back(group.asUInt());
  }
  std::sort(user.groups.begin(), user.groups.end());
  user.groups.erase(std::unique(user.groups.begin(), user.groups.end()), user.groups.end());
  for (const Json::Value& rule : rules) {
    const std::optional<Meant> meant = ReadMeant(rule);
    if (!meant.has_value()) return false;
    user.meant.push_back(*meant);
  }
  return true;
}

[[noreturn]] void FailLater() {
  throw UserError(Error::kEngineUserBusy, "the user cannot be looked up now; try again");
}

}  // namespace

Meant NamedUser::IsMeantBy(const std::string& name) const {
  const auto found = std::lower_bound(names->begin(), names->end(), name);
  return found == names->end() || *found != name ? Meant::kUnknown : meant[found - names->begin()];
}

bool NamedUsers::IsTrusted(uint32_t uid) const {
  const std::vector<uint32_t> clients = sources_.trust().clients;
  return std::find(clients.begin(), clients.end(), uid) != clients.end();
}

/// Null for what is not an answer.
NamedUsers::AccountPtr NamedUsers::ReadAccount(const std::string& text,
                                               std::shared_ptr<const std::vector<std::string>> names) {
  Json::Value told;
  if (!fromString(told, text) || !told.isObject()) return nullptr;
  Account account;
  if (told.empty()) return std::make_shared<const Account>();
  account.user.names = std::move(names);
  if (!told["may_log_in"].isBool() || !ReadNamedUser(told, account.user)) return nullptr;
  account.may_log_in = told["may_log_in"].asBool();
  return std::make_shared<const Account>(std::move(account));
}

/// Which of the reasons keeps a user from being asked for is not told.
NamedUserPtr NamedUsers::Find(const Json::Value& user, std::vector<std::string> names) {
  const std::vector<std::string> key = UserArguments(user);
  const AccountPtr account = LookUp(key, std::make_shared<const std::vector<std::string>>(std::move(names)));
  const uint32_t uid = account->user.uid;
  const Trust trust = sources_.trust();
  const bool ended = std::find(trust.ended.begin(), trust.ended.end(), uid) != trust.ended.end();
  const bool permitted = account->may_log_in && !ended && uid != 0 && uid != UINT32_MAX && uid != instance_owner_ &&
                         uid >= trust.least_user;
  if (!permitted) {
    throw UserError(Error::kEngineNotPermitted, "\"" + key.back() + "\" may not search by way of another program");
  }
  return {account, &account->user};
}

/// Names that have changed since an answer make it an old one; an account without names is none.
NamedUsers::AccountPtr NamedUsers::LookUp(const std::vector<std::string>& key,
                                          std::shared_ptr<const std::vector<std::string>> names) {
  {
    const base::MutexLock lock(mutex_);
    if (names_ != nullptr && *names_ == *names) names = names_;
    names_ = names;
    const auto found = kept_.find(key);
    if (found != kept_.end() && Clock::now() < found->second.until) {
      const AccountPtr& account = found->second.account;
      if (account == nullptr) FailLater();
      if (account->user.names == nullptr || account->user.names == names) return account;
    }
    if (look_ups_ >= kLookUpsMax) FailLater();
    ++look_ups_;
  }
  AccountPtr account;
  const base::ScopeExit end([&] {
    const base::MutexLock lock(mutex_);
    --look_ups_;
  });
  std::vector<std::string> arguments = key;
  arguments.insert(arguments.end(), names->begin(), names->end());
  const std::optional<std::string> text = sources_.look_up(arguments);
  if (text.has_value()) account = ReadAccount(*text, std::move(names));
  const base::MutexLock lock(mutex_);
  Keep(key, account);
  if (account == nullptr) FailLater();
  return account;
}

/// The one that would be forgotten first makes room.
void NamedUsers::Keep(const std::vector<std::string>& key, AccountPtr account) {
  if (kept_.size() >= kKeptMax && !kept_.contains(key)) {
    kept_.erase(std::min_element(kept_.begin(), kept_.end(),
                                 [](const auto& a, const auto& b) { return a.second.until < b.second.until; }));
  }
  const Clock::time_point until = Clock::now() + (account != nullptr ? kKeepFound : kKeepFailed);
  kept_[key] = {std::move(account), until};
}

NamedUsers::Turn::Turn(NamedUsers& users, uint32_t uid) : users_(users), uid_(uid) {
  const base::MutexLock lock(users_.mutex_);
  if (users_.at_work_[uid_] >= kTurnsOfNamed) {
    throw UserError(Error::kEngineUserBusy,
                    "too many requests for this user are at work; ask again when some of them are answered");
  }
  ++users_.at_work_[uid_];
}

NamedUsers::Turn::~Turn() {
  const base::MutexLock lock(users_.mutex_);
  if (--users_.at_work_[uid_] == 0) users_.at_work_.erase(uid_);
}

}  // namespace ferrox::engine
