#include "cli/as_user.h"

#include <grp.h>
#include <pwd.h>

#include <cerrno>
#include <cstring>
#include <limits>
#include <optional>

#include "cli/caller.h"

namespace ferrox::cli {

namespace {

/// Nothing for what is no number of a user or group. The largest one stands for none in system calls.
std::optional<uint32_t> IdOf(const std::string& text) {
  constexpr size_t kDigitsMax = 10;
  if (text.empty() || text.size() > kDigitsMax || text.find_first_not_of("0123456789") != std::string::npos) return {};
  const unsigned long long number = std::stoull(text);
  if (number >= std::numeric_limits<uint32_t>::max()) return {};
  return static_cast<uint32_t>(number);
}

/// The account of a name or a number; false when there is none. @throws Failure.
bool FindAccount(const std::string& text, AskedUser& user, gid_t& group) {
  constexpr size_t kAccountBytesMax = 65536;
  std::vector<char> names(kAccountBytesMax);
  passwd account = {};
  passwd* found = nullptr;
  int problem = getpwnam_r(text.c_str(), &account, names.data(), names.size(), &found);
  const std::optional<uint32_t> uid = IdOf(text);
  if (found == nullptr && uid.has_value()) {
    problem = getpwuid_r(*uid, &account, names.data(), names.size(), &found);
  }
  if (found == nullptr && (problem == EIO || problem == EMFILE || problem == ENFILE || problem == ERANGE)) {
    throw Failure("the accounts cannot be asked for user " + text + ": " + strerror(problem));
  }
  if (found == nullptr) return false;
  user.name = account.pw_name;
  user.uid = account.pw_uid;
  group = account.pw_gid;
  return true;
}

/// All groups of an account, the main one first.
std::vector<gid_t> GroupsOf(const AskedUser& user, gid_t main_group) {
  constexpr int kGroupsMax = 65536;  // the kernel's own limit
  std::vector<gid_t> groups(kGroupsMax);
  int count = kGroupsMax;
  if (getgrouplist(user.name.c_str(), main_group, groups.data(), &count) < 0) {
    throw Failure("user " + user.name + " is in too many groups");
  }
  groups.resize(static_cast<size_t>(count));
  return groups;
}

}  // namespace

AskedUser ReadAskedUser(const std::string& text) {
  AskedUser user;
  gid_t group = 0;
  const size_t colon = text.find(':');
  if (colon == std::string::npos && FindAccount(text, user, group)) {
    user.groups = GroupsOf(user, group);
  } else {
    const std::optional<uint32_t> uid = IdOf(text.substr(0, colon));
    if (!uid.has_value())
      throw UsageError("there is no user \"" + text + "\"; give an account, or numbers as in 5001:100,200");
    if (colon == std::string::npos) {
      throw UsageError("there is no user " + text + "; give the groups' numbers as well, as in " + text + ":100,200");
    }
    user.name = text.substr(0, colon);
    user.uid = *uid;
    for (const std::string& part : Split(text.substr(colon + 1), ',')) {
      const std::optional<uint32_t> id = IdOf(part);
      if (!id.has_value()) throw UsageError("\"" + part + "\" is not the number of a group");
      user.groups.push_back(*id);
    }
  }
  if (user.uid == 0) throw UsageError("root finds everything; --as is for other users");
  return user;
}

Json::Value ToJson(const AskedUser& user) {
  Json::Value json;
  json["uid"] = Json::UInt(user.uid);
  for (const gid_t group : user.groups) json["groups"].append(Json::UInt(group));
  return json;
}

AskedUser UserOf(const Arguments& arguments) {
  if (!IsPrivileged()) throw NotPermitted("only root and the owner of this instance may ask as another user");
  return ReadAskedUser(arguments.Get("--as"));
}

}  // namespace ferrox::cli
