#include "platform/host/share_users.h"

#include <algorithm>
#include <optional>
#include <sstream>

#include "base/text.h"

namespace kova::host {

namespace {

constexpr size_t kUserNameMaxBytes = 255;
constexpr size_t kUserNamesMax = 1000;
/// Modules by which rights are kept that no file's mode or ACL shows.
constexpr const char* kForeignRights[] = {"nfs4acl_xattr", "zfsacl", "gpfs", "afsacl"};
/// Modules that keep a file's Windows ACL beside its rights, which are made to suit it.
constexpr const char* kWindowsRights[] = {"acl_xattr", "acl_tdb"};

/// The parts of a list, which blanks and commas separate; quotation marks hold a part with blanks together, also behind
/// the sign of a group. Nothing for one that does not end.
std::optional<std::vector<std::string>> ListParts(const std::string& list) {
  std::vector<std::string> parts;
  std::string part;
  bool quoted = false;
  for (const char c : list + ' ') {
    if (c == '"') {
      quoted = !quoted;
    } else if (quoted || std::string(" \t\r\n,").find(c) == std::string::npos) {
      part += c;
    } else if (!part.empty()) {
      parts.push_back(std::move(part));
      part.clear();
    }
  }
  if (quoted) return std::nullopt;
  return parts;
}

bool HasModule(const std::string& modules, const std::string& wanted) {
  std::istringstream words(modules);
  // A module may carry the name of an instance after a colon, or its path before it.
  for (std::string word; words >> word;) {
    word = word.substr(0, word.find(':'));
    if (word.substr(word.rfind('/') + 1) == wanted) return true;
  }
  return false;
}

/// Takes one of the lists. @return why it cannot be judged; "" when it can.
std::string TakeUserList(const SmbConf& conf, const std::string& section, const char* parameter,
                         std::vector<std::string>& names) {
  const std::string value = conf.Get(section, parameter).value_or("");
  const std::string rule = std::string("Samba's rule \"") + parameter + "\" ";
  if (value.find('%') != std::string::npos) return rule + "has a macro";
  const std::optional<std::vector<std::string>> parts = ListParts(value);
  if (!parts.has_value()) return rule + "has quotation marks without an end";
  if (parts->size() > kUserNamesMax) return rule + "has over " + std::to_string(kUserNamesMax) + " names";
  for (const std::string& name : *parts) {
    const std::string problem = UserNameProblem(name);
    if (!problem.empty()) return rule + problem;
  }
  names = *parts;
  return {};
}

}  // namespace

std::string UserNameProblem(const std::string& name) {
  const bool group = name.starts_with("@") || name.starts_with("+");
  const std::string plain = group ? name.substr(1) : name;
  if (plain.empty()) return "has an empty name";
  if (plain.front() == '&' || (group && (plain.front() == '@' || plain.front() == '+'))) {
    return "names a netgroup (" + name + ")";
  }
  if (base::LowerAscii(plain).starts_with("s-1-")) return "names a security id (" + name + ")";
  const bool control = std::any_of(plain.begin(), plain.end(), [](unsigned char c) { return c < 0x20 || c == 0x7f; });
  if (control || plain.size() > kUserNameMaxBytes) return "has a name that no user can have";
  return {};
}

/// The guest account comes in only where guests may: it is no user of whom Samba has proof.
ShareUsers SambaUsers(const SmbConf& conf, const std::string& section) {
  ShareUsers users;
  const auto close = [&users](const std::string& reason) {
    if (users.closed.empty()) users.closed = reason;
  };
  close(TakeUserList(conf, section, "valid users", users.valid));
  close(TakeUserList(conf, section, "invalid users", users.invalid));
  for (const char* hosts : {"hosts allow", "hosts deny", "allow hosts", "deny hosts"}) {
    if (!conf.Get(section, hosts).value_or("").empty()) {
      close(std::string("Samba's rule \"") + hosts + "\" goes by the host that a user comes from");
    }
  }
  const std::string modules = conf.Get(section, "vfs objects").value_or("");
  for (const char* module : kWindowsRights) {
    if (HasModule(modules, module)) close(std::string("Samba's module ") + module + " may refuse more than files do");
  }
  if (!conf.IsOn(section, "guest ok")) {
    const std::string guest = conf.Get("global", "guest account").value_or("nobody");
    if (!guest.empty()) users.invalid.push_back(guest);
  }
  if (!users.closed.empty()) users = {{}, {}, users.closed};
  return users;
}

std::string SambaRightsProblem(const SmbConf& conf, const std::string& section) {
  const std::string modules = conf.Get(section, "vfs objects").value_or("");
  const std::string tail = " keeps rights that the files' own do not show";
  for (const char* module : kForeignRights) {
    if (HasModule(modules, module)) return std::string("Samba's module ") + module + tail;
  }
  for (const char* module : kWindowsRights) {
    const bool alone = conf.IsOn(section, std::string(module) + ":ignore system acls");
    if (alone && HasModule(modules, module)) return std::string("Samba's module ") + module + tail;
  }
  return {};
}

}  // namespace kova::host
