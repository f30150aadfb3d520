#pragma once

#include <set>
#include <string>

#include <kova/recycle.h>

/// Where accounts come from. The name service answers for all of its sources alike, so this is read off its files:
/// an account that stands in /etc/passwd is a local one; another is of a domain when its name has a "\" or "@" in it,
/// or when winbind is the only network source in nsswitch.conf's "passwd" line; else of a directory service.
namespace kova::host {

/// Where an account that is not local comes from.
AUTH_TYPE NetworkSource(const std::string& user, const std::string& nsswitch);

class AccountSources {
 public:
  /// Reads the host's files; the answers are those of this moment.
  AccountSources();

  /// One of AUTH_TYPE; 0 when nobody has an account of that name.
  int Of(const std::string& user) const;

 private:
  std::set<std::string> local_;
  std::string nsswitch_;
};

}  // namespace kova::host
