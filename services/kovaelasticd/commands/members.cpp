#include "services/kovaelasticd/commands/members.h"

#include "common/error.h"

namespace ferrox::engine {

namespace {

// What is refused as no id or path, rather than found out by the file system.
constexpr size_t kIdMaxBytes = 512;
constexpr size_t kPathMaxBytes = 8192;

}  // namespace

void RefuseMember(const char* name, const std::string& must_be) {
  throw Error(Error::kEngineBadRequest, "\"" + std::string(name) + "\" must be " + must_be);
}

std::string CheckedPath(const char* name, const std::string& path) {
  const bool usable =
      !path.empty() && path.front() == '/' && path.size() <= kPathMaxBytes && path.find('\0') == std::string::npos;
  if (!usable) RefuseMember(name, "an absolute path of at most 8192 bytes");
  return path;
}

std::string RequiredText(const Json::Value& data, const char* name) {
  if (!data.isObject() || !data[name].isString()) RefuseMember(name, "given as a text");
  return data[name].asString();
}

std::optional<std::string> OptionalText(const Json::Value& data, const char* name) {
  const Json::Value& member = data[name];
  if (member.isNull()) return std::nullopt;
  if (!member.isString()) RefuseMember(name, "a text");
  return member.asString();
}

const Json::Value& RequiredObject(const Json::Value& data, const char* name) {
  const Json::Value& member = data[name];
  if (!member.isObject()) RefuseMember(name, "given as an object");
  return member;
}

int64_t OptionalInt(const Json::Value& data, const char* name, int64_t otherwise, int64_t low, int64_t high) {
  const Json::Value& member = data[name];
  if (member.isNull()) return otherwise;
  if (!member.isInt64() || member.asInt64() < low || member.asInt64() > high) {
    RefuseMember(name, "a whole number from " + std::to_string(low) + " to " + std::to_string(high));
  }
  return member.asInt64();
}

bool OptionalBool(const Json::Value& data, const char* name, bool otherwise) {
  const Json::Value& member = data[name];
  if (member.isNull()) return otherwise;
  if (!member.isBool()) RefuseMember(name, "true or false");
  return member.asBool();
}

std::string IndexId(const Json::Value& data) {
  const std::string id = RequiredText(data, "id");
  if (id.empty() || id.size() > kIdMaxBytes) RefuseMember("id", "an index id of 1 to 512 bytes");
  return id;
}

}  // namespace ferrox::engine
