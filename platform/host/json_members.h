#pragma once

#include <cstdint>
#include <string>
#include <vector>

#include <json/value.h>

/// For files that people write: a member of the wrong type is a mistake to be reported, not a missing one. Each reads a
/// member of an object; false, with `out` as it was (an array: with a part of it), when it has another type. A missing
/// member is no mistake and leaves `out` as it was.
namespace kova::host {

inline bool ReadMember(const Json::Value& object, const char* key, bool& out) {
  if (!object.isMember(key)) return true;
  if (!object[key].isBool()) return false;
  out = object[key].asBool();
  return true;
}

inline bool ReadMember(const Json::Value& object, const char* key, std::string& out) {
  if (!object.isMember(key)) return true;
  if (!object[key].isString()) return false;
  out = object[key].asString();
  return true;
}

inline bool ReadMember(const Json::Value& object, const char* key, uint32_t& out) {
  if (!object.isMember(key)) return true;
  if (!object[key].isUInt()) return false;
  out = object[key].asUInt();
  return true;
}

/// An array of texts.
inline bool ReadMember(const Json::Value& object, const char* key, std::vector<std::string>& out) {
  if (!object.isMember(key)) return true;
  if (!object[key].isArray()) return false;
  out.clear();
  for (const Json::Value& element : object[key]) {
    if (!element.isString()) return false;
    out.push_back(element.asString());
  }
  return true;
}

}  // namespace kova::host
