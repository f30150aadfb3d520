#include "cli/format.h"

#include <time.h>

#include <cstdio>

namespace ferrox::cli {

namespace {

template <typename... Values>
std::string Formatted(const char* format, Values... values) {
  char text[64];
  (void)snprintf(text, sizeof(text), format, values...);
  return text;
}

/// Null for a member that is missing, or where there is no object.
const Json::Value& MemberOf(const Json::Value& object, const char* key) {
  return object.isObject() ? object[key] : Json::Value::nullSingleton();
}

}  // namespace

std::string Count(uint64_t number) {
  std::string text = std::to_string(number);
  for (size_t at = text.size(); at > 3; at -= 3) text.insert(at - 3, 1, ',');
  return text;
}

/// 999.5 is where "%.0f" would write "1000".
std::string Size(int64_t bytes) {
  constexpr const char* kUnits[] = {"KB", "MB", "GB", "TB", "PB"};
  if (bytes < 1000) return std::to_string(bytes) + " B";
  double value = static_cast<double>(bytes) / 1000;
  size_t unit = 0;
  for (; value >= 999.5 && unit < 4; ++unit) value /= 1000;
  return Formatted(value < 9.95 ? "%.1f %s" : "%.0f %s", value, kUnits[unit]);
}

std::string Date(int64_t seconds) {
  const auto when = static_cast<time_t>(seconds);
  struct tm local = {};
  char text[64];
  if (seconds == 0 || localtime_r(&when, &local) == nullptr) return "-";
  return strftime(text, sizeof(text), "%Y-%m-%d %H:%M", &local) == 0 ? "-" : text;
}

/// Tenths of a second below 10 s, whole seconds below an hour, minutes above.
std::string Duration(double seconds) {
  const auto whole = static_cast<long long>(seconds + 0.5);
  if (seconds < 10) return Formatted("%.1f s", seconds);
  if (whole < 60) return Formatted("%lld s", whole);
  if (whole < 3600) return Formatted("%lld min %lld s", whole / 60, whole % 60);
  return Formatted("%lld h %lld min", whole / 3600, whole % 3600 / 60);
}

uint64_t UintOf(const Json::Value& object, const char* key) {
  const Json::Value& member = MemberOf(object, key);
  return member.isUInt64() ? member.asUInt64() : 0;
}

int64_t IntOf(const Json::Value& object, const char* key) {
  const Json::Value& member = MemberOf(object, key);
  return member.isInt64() ? member.asInt64() : 0;
}

bool BoolOf(const Json::Value& object, const char* key) {
  const Json::Value& member = MemberOf(object, key);
  return member.isBool() && member.asBool();
}

std::string TextOf(const Json::Value& object, const char* key) {
  const Json::Value& member = MemberOf(object, key);
  return member.isString() ? member.asString() : "";
}

}  // namespace ferrox::cli
