// Asks the name service about one user, in a process that can be ended when a directory's server does not answer.
//
//   kova-accounts (name NAME | uid N) [RULE...]
//
// Writes one object of JSON: {} when there is no such user, else {"uid": N, "gids": [N, ...], "may_log_in": BOOL,
// "rules": ["yes" | "no" | "unknown", ...]}, one answer for each RULE: whether that name of a share's rules means the
// user ("ann", "+group", "@group"). Exit code 1 when the name service fails, 2 for other arguments.
#include <errno.h>
#include <grp.h>
#include <netdb.h>
#include <pwd.h>
#include <shadow.h>
#include <strings.h>
#include <time.h>
#include <unistd.h>

#include <algorithm>
#include <cstdio>
#include <cstdlib>
#include <string>
#include <vector>

namespace {

constexpr size_t kBufferBytesMax = 16U << 20;  // of one entry: a group with very many members
constexpr int kGroupsMax = 65536;              // the kernel's NGROUPS_MAX
constexpr long kSecondsOfDay = 24L * 60 * 60;

/// One of the name service's functions, with a buffer that is large enough. 0, also when there is no such entry
/// (`found` is null then), or an errno.
template <typename Entry, typename Ask>
int AskService(std::vector<char>& buffer, Entry*& found, Ask ask) {
  int error = ERANGE;
  for (buffer.resize(4096); error == ERANGE && buffer.size() <= kBufferBytesMax; buffer.resize(buffer.size() * 4)) {
    found = nullptr;
    error = ask(buffer.data(), buffer.size(), &found);
    if (error != ERANGE) break;  // the entry points into the buffer
  }
  return error;
}

struct Found {
  std::string name, shell;
  uid_t uid = 0;
  gid_t gid = 0;
  bool exists = false;
};

template <typename Ask>
int FindUser(Found& user, Ask ask) {
  std::vector<char> buffer;
  passwd entry = {};
  passwd* found = nullptr;
  const int error =
      AskService(buffer, found, [&](char* data, size_t size, passwd** out) { return ask(&entry, data, size, out); });
  if (error == 0 && found != nullptr) user = {entry.pw_name, entry.pw_shell, entry.pw_uid, entry.pw_gid, true};
  return error;
}

int FindByName(const std::string& name, Found& user) {
  return FindUser(user, [&name](passwd* entry, char* data, size_t size, passwd** out) {
    return getpwnam_r(name.c_str(), entry, data, size, out);
  });
}

int FindByUid(uid_t uid, Found& user) {
  return FindUser(user, [uid](passwd* entry, char* data, size_t size, passwd** out) {
    return getpwuid_r(uid, entry, data, size, out);
  });
}

/// False when there are more than the kernel takes.
bool FindGroups(const Found& user, std::vector<gid_t>& groups) {
  int count = 64;
  for (groups.resize(count); getgrouplist(user.name.c_str(), user.gid, groups.data(), &count) < 0;) {
    count = std::max<int>(count, 2 * static_cast<int>(groups.size()));
    if (count > kGroupsMax) return false;
    groups.resize(count);
  }
  groups.resize(count);
  return true;
}

bool IsShellToLogIn(const std::string& given) {
  const std::string shell = given.empty() ? "/bin/sh" : given;
  const std::string program = shell.substr(shell.rfind('/') + 1);
  if (program == "nologin" || program == "false") return false;
  if (access("/etc/shells", F_OK) != 0) return true;
  for (const char* listed = getusershell(); listed != nullptr; listed = getusershell()) {
    if (shell == listed) return true;
  }
  return false;
}

/// Where the entry cannot be read, an account has no end.
bool HasEnded(const std::string& name) {
  std::vector<char> buffer;
  spwd entry = {};
  spwd* found = nullptr;
  (void)AskService(buffer, found, [&](char* data, size_t size, spwd** out) {
    return getspnam_r(name.c_str(), &entry, data, size, out);
  });
  return found != nullptr && entry.sp_expire >= 0 && time(nullptr) / kSecondsOfDay >= entry.sp_expire;
}

/// A user's name. Some directories take names in any case: one that differs in case alone is not judged.
const char* MeansUser(const std::string& rule, const Found& user) {
  if (rule == user.name) return "yes";
  Found other;
  if (FindByName(rule, other) != 0) return "unknown";
  if (other.exists && other.uid == user.uid) return "yes";
  return strcasecmp(rule.c_str(), user.name.c_str()) == 0 ? "unknown" : "no";
}

const char* MeansGroup(const std::string& rule, const std::vector<gid_t>& groups) {
  std::vector<char> buffer;
  group entry = {};
  group* found = nullptr;
  const int error = AskService(buffer, found, [&](char* data, size_t size, group** out) {
    return getgrnam_r(rule.c_str(), &entry, data, size, out);
  });
  if (error != 0 || found == nullptr) return "unknown";
  return std::find(groups.begin(), groups.end(), entry.gr_gid) != groups.end() ? "yes" : "no";
}

/// "@" may stand before a netgroup, too, whose answer is not gone by: hosts may be meant.
const char* Means(const std::string& rule, const Found& user, const std::vector<gid_t>& groups) {
  const bool at = rule.starts_with("@");
  if (!at && !rule.starts_with("+")) return MeansUser(rule, user);
  const std::string name = rule.substr(1);
  const std::string answer = MeansGroup(name, groups);
  const bool netgroup = at && answer == "no" && innetgr(name.c_str(), nullptr, user.name.c_str(), nullptr) != 0;
  return answer == "yes" ? "yes" : answer == "no" && !netgroup ? "no" : "unknown";
}

void Write(const Found& user, const std::vector<gid_t>& groups, const std::vector<std::string>& rules) {
  (void)printf("{\"uid\":%u,\"may_log_in\":%s,\"gids\":[", user.uid,
               IsShellToLogIn(user.shell) && !HasEnded(user.name) ? "true" : "false");
  for (size_t i = 0; i < groups.size(); ++i) (void)printf("%s%u", i == 0 ? "" : ",", groups[i]);
  (void)printf("],\"rules\":[");
  for (size_t i = 0; i < rules.size(); ++i) {
    (void)printf("%s\"%s\"", i == 0 ? "" : ",", Means(rules[i], user, groups));
  }
  (void)printf("]}\n");
}

}  // namespace

int main(int argc, char** argv) {
  const std::vector<std::string> arguments(argv + 1, argv + argc);
  if (arguments.size() < 2 || (arguments[0] != "name" && arguments[0] != "uid")) return 2;
  Found user;
  const int error = arguments[0] == "name"
                        ? FindByName(arguments[1], user)
                        : FindByUid(static_cast<uid_t>(strtoul(arguments[1].c_str(), nullptr, 10)), user);
  if (error != 0) return 1;
  std::vector<gid_t> groups;
  if (user.exists && !FindGroups(user, groups)) return 1;
  user.exists ? Write(user, groups, {arguments.begin() + 2, arguments.end()}) : (void)printf("{}\n");
  return fflush(stdout) == 0 ? 0 : 1;
}
