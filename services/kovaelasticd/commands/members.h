#pragma once

#include <cstdint>
#include <optional>
#include <string>

#include <json/value.h>

namespace ferrox::engine {

// Reading of members, common to all commands. Null and a missing member are the same, and stand for `otherwise`.
// @throws Error kEngineBadRequest naming the member and what it must be.
std::string RequiredText(const Json::Value& data, const char* name);
std::optional<std::string> OptionalText(const Json::Value& data, const char* name);
const Json::Value& RequiredObject(const Json::Value& data, const char* name);
int64_t OptionalInt(const Json::Value& data, const char* name, int64_t otherwise, int64_t low, int64_t high);
bool OptionalBool(const Json::Value& data, const char* name, bool otherwise);

[[noreturn]] void RefuseMember(const char* name, const std::string& must_be);
/// `path`, if it is one that a document or an index may have. `name` is the member that it stands in.
std::string CheckedPath(const char* name, const std::string& path);
/// The member "id" of a command on an index.
std::string IndexId(const Json::Value& data);

}  // namespace ferrox::engine
