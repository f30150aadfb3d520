#include "platform/host/account_source.h"

#include <sstream>

#include "platform/host/accounts.h"
#include "platform/host/files.h"

namespace kova::host {

namespace {

std::string HostFile(const char* path) {
  std::string text;
  (void)ReadTextFile(path, text);  // what cannot be read names nobody
  return text;
}

/// The words of the line "passwd: files winbind".
std::set<std::string> PasswdSources(const std::string& nsswitch) {
  std::istringstream lines(nsswitch);
  for (std::string line; std::getline(lines, line);) {
    std::istringstream words(line.substr(0, line.find('#')));
    std::string word;
    if (!(words >> word) || word != "passwd:") continue;
    std::set<std::string> sources;
    while (words >> word) sources.insert(word);
    return sources;
  }
  return {};
}

}  // namespace

AUTH_TYPE NetworkSource(const std::string& user, const std::string& nsswitch) {
  if (user.find_first_of("\\@") != std::string::npos) return AUTH_DOMAIN;
  const std::set<std::string> sources = PasswdSources(nsswitch);
  const bool winbind_only = sources.count("winbind") != 0 && sources.count("ldap") == 0 && sources.count("sss") == 0;
  return winbind_only ? AUTH_DOMAIN : AUTH_LDAP;
}

AccountSources::AccountSources() : nsswitch_(HostFile("/etc/nsswitch.conf")) {
  std::istringstream lines(HostFile("/etc/passwd"));
  for (std::string line; std::getline(lines, line);) local_.insert(line.substr(0, line.find(':')));
}

int AccountSources::Of(const std::string& user) const {
  if (local_.count(user) != 0) return AUTH_LOCAL;
  Account account;
  return FindAccount(user, account) ? NetworkSource(user, nsswitch_) : 0;
}

}  // namespace kova::host
