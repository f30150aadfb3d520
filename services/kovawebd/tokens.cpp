#include "services/kovawebd/tokens.h"

#include <sys/random.h>
#include <sys/stat.h>
#include <syslog.h>
#include <unistd.h>

#include <algorithm>
#include <array>
#include <cerrno>
#include <cstdio>
#include <nettle/sha2.h>
#include <utility>

#include <json/value.h>

#include "common/error.h"
#include "common/file_util.h"
#include "common/json_util.h"
#include "common/log.h"
#include "services/kovawebd/message.h"

namespace ferrox::web {

Json::Value ToJson(const Token& token) {
  Json::Value json;
  json["id"] = token.id;
  json["name"] = token.name;
  json["user"] = Json::UInt(token.user);
  json["scope"] = token.scope;
  json["created"] = Json::Int64(token.created);
  json["expires"] = Json::Int64(token.expires);
  return json;
}

namespace {

constexpr size_t kTokensOfUserMax = 50, kTokensMax = 10000;
constexpr size_t kSecretBytes = 32, kIdBytes = 4;
constexpr char kSecretPrefix[] = "kova_";  // so that programs that look for secrets know one
constexpr char kScope[] = "search";

template <size_t Size>
std::string Hexadecimal(const std::array<uint8_t, Size>& bytes) {
  constexpr char kDigits[] = "0123456789abcdef";
  std::string text;
  for (const uint8_t byte : bytes) {
    text += kDigits[byte >> 4];
    text += kDigits[byte & 15];
  }
  return text;
}

template <size_t Size>
std::string RandomHexadecimal() {
  std::array<uint8_t, Size> bytes;
  if (getrandom(bytes.data(), bytes.size(), 0) != static_cast<ssize_t>(bytes.size())) {
    throw Problem{503, "no random numbers are to be had"};
  }
  return Hexadecimal(bytes);
}

std::string HashOf(const std::string& secret) {
  std::array<uint8_t, SHA256_DIGEST_SIZE> digest;
  sha256_ctx context;
  sha256_init(&context);
  sha256_update(&context, secret.size(), reinterpret_cast<const uint8_t*>(secret.data()));
  sha256_digest(&context, digest.size(), digest.data());
  return Hexadecimal(digest);
}

Json::Value ToFileEntry(const std::string& hash, const Token& token) {
  Json::Value json = ToJson(token);
  json["sha256"] = hash;
  return json;
}

/// False for what is not an entry of such a file.
bool ReadFileEntry(const Json::Value& json, std::string& hash, Token& token) {
  const bool shaped = json.isObject() && json["sha256"].isString() && json["id"].isString() &&
                      json["name"].isString() && json["user"].isUInt() && json["scope"].isString() &&
                      json["created"].isInt64() && json["expires"].isInt64();
  if (!shaped) return false;
  hash = json["sha256"].asString();
  token = {json["id"].asString(),    json["name"].asString(),   json["user"].asUInt(),
           json["scope"].asString(), json["created"].asInt64(), json["expires"].asInt64()};
  return true;
}

bool MayTouch(uid_t user, const Token& token) { return user == 0 || user == token.user; }

}  // namespace

Tokens::Tokens(std::string path) : path_(std::move(path)) {
  if (access(path_.c_str(), F_OK) != 0) return;
  Json::Value json;
  bool good = fromFile(json, path_) && json.isArray();
  for (const Json::Value& entry : json) {
    std::string hash;
    Token token;
    good = good && ReadFileEntry(entry, hash, token);
    if (good) tokens_.emplace(std::move(hash), std::move(token));
  }
  if (good) return;
  const base::MutexLock lock(mutex_);
  tokens_.clear();
  Log(LOG_ERR, "%s is damaged; it is kept as %s.damaged, and users have to make new tokens", path_.c_str(),
      path_.c_str());
  (void)rename(path_.c_str(), (path_ + ".damaged").c_str());
}

/// Only the daemon's user may enter the folder, and read the file.
void Tokens::Save(const ByHash& tokens) const {
  Json::Value json(Json::arrayValue);
  for (const auto& [hash, token] : tokens) json.append(ToFileEntry(hash, token));
  if (WriteWholeFile(path_, toString(json)) && chmod(path_.c_str(), 0600) == 0) return;
  Log(LOG_ERR, "cannot write %s: %s", path_.c_str(), ErrnoText().c_str());
  throw Problem{503, "the tokens cannot be written; the daemon's log tells why"};
}

Tokens::Made Tokens::Create(uid_t user, const std::string& name, int64_t now, int64_t expires) {
  Made made{{RandomHexadecimal<kIdBytes>(), name, user, kScope, now, expires},
            kSecretPrefix + RandomHexadecimal<kSecretBytes>()};
  const base::MutexLock lock(mutex_);
  ByHash tokens = tokens_;
  std::erase_if(tokens, [now](const auto& entry) { return entry.second.expires <= now; });
  const auto is_users = [user](const auto& entry) { return entry.second.user == user; };
  const auto clashes = [&](const auto& entry) {
    return entry.second.id == made.token.id || (is_users(entry) && entry.second.name == name);
  };
  if (std::any_of(tokens.begin(), tokens.end(), clashes)) throw Problem{400, "there is a token of that name already"};
  const auto count = static_cast<size_t>(std::count_if(tokens.begin(), tokens.end(), is_users));
  if (count >= kTokensOfUserMax || tokens.size() >= kTokensMax) {
    throw Problem{400, "there are too many tokens; revoke some"};
  }
  tokens.emplace(HashOf(made.secret), made.token);
  Save(tokens);
  tokens_ = std::move(tokens);
  return made;
}

std::vector<Token> Tokens::Of(uid_t user) const {
  const base::MutexLock lock(mutex_);
  std::vector<Token> found;
  for (const auto& [hash, token] : tokens_) {
    if (MayTouch(user, token)) found.push_back(token);
  }
  std::sort(found.begin(), found.end(),
            [](const Token& a, const Token& b) { return std::pair(a.created, a.id) < std::pair(b.created, b.id); });
  return found;
}

bool Tokens::Revoke(uid_t user, const std::string& id) {
  const base::MutexLock lock(mutex_);
  ByHash tokens = tokens_;
  const size_t removed =
      std::erase_if(tokens, [&](const auto& entry) { return entry.second.id == id && MayTouch(user, entry.second); });
  if (removed == 0) return false;
  Save(tokens);
  tokens_ = std::move(tokens);
  return true;
}

std::optional<Token> Tokens::Find(const std::string& secret, int64_t now) const {
  const std::string hash = HashOf(secret);
  const base::MutexLock lock(mutex_);
  const auto found = tokens_.find(hash);
  const bool good = found != tokens_.end() && now < found->second.expires && found->second.scope == kScope;
  return good ? std::optional(found->second) : std::nullopt;
}

}  // namespace ferrox::web
