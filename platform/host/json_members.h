#pragma once

#include <cstdint>
#include <string>

#include <json/value.h>

/// Each reads a member of an object; false when it is there with another type. A missing one leaves `out` as it is.
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

}  // namespace kova::host
