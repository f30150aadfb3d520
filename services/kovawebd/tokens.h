#pragma once

#include <sys/types.h>

#include <cstdint>
#include <map>
#include <optional>
#include <string>
#include <vector>

#include <json/forwards.h>

#include "base/mutex.h"

namespace ferrox::web {

/// What stands for a user in requests by TCP. The secret itself is kept nowhere.
struct Token {
  std::string id;  ///< by which it is revoked
  std::string name;
  uid_t user = 0;
  std::string scope;  ///< what it is good for; "search"
  int64_t created = 0, expires = 0;
};
/// What may be told of it: all members.
Json::Value ToJson(const Token& token);

/// The tokens of all users, in one file. Any thread may call any member; those that change something block until the
/// disk has it.
class Tokens {
 public:
  /// Reads the file; a missing one holds none. One that is damaged is set aside and logged: its tokens are no more.
  explicit Tokens(std::string path);

  struct Made {
    Token token;
    std::string secret;  ///< 256 bits
  };
  /// @throws Problem 400 when the user has too many or one of that name, 503 when it cannot be kept.
  Made Create(uid_t user, const std::string& name, int64_t now, int64_t expires);
  /// Those of the user; root's view is all.
  std::vector<Token> Of(uid_t user) const;
  /// Root may revoke anybody's. @return whether there was one. @throws Problem 503.
  bool Revoke(uid_t user, const std::string& id);
  /// The token of that secret, unless it has expired.
  std::optional<Token> Find(const std::string& secret, int64_t now) const;

 private:
  using ByHash = std::map<std::string, Token>;  ///< SHA-256 of the secret, in hexadecimal digits

  void Save(const ByHash& tokens) const;

  const std::string path_;
  mutable base::Mutex mutex_;
  ByHash tokens_ BASE_GUARDED_BY(mutex_);
};

}  // namespace ferrox::web
