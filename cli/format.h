#pragma once

#include <cstdint>
#include <string>

#include <json/value.h>

/// How figures are written for people, and how members of replies are read that a daemon of another version may lack.
namespace ferrox::cli {

/// "734", "45,210".
std::string Count(uint64_t number);
/// "512 B", "3.4 KB", "12 MB": powers of 1000, two digits at least.
std::string Size(int64_t bytes);
/// "2026-11-21 07:05" in local time; "-" for 0.
std::string Date(int64_t seconds);
/// "0.8 s", "12 s", "3 min 20 s", "2 h 5 min".
std::string Duration(double seconds);

/// How the reason begins that the index holds of a file which was read, but not all of it. Part of what is stored: the
/// index has a text for each file that was not read as a whole, and only its beginning tells the two cases apart.
inline constexpr char kPartlyRead[] = "partly read: ";

/// Members of a reply, 0, "" or false when they are missing or of another type.
uint64_t UintOf(const Json::Value& object, const char* key);
int64_t IntOf(const Json::Value& object, const char* key);
std::string TextOf(const Json::Value& object, const char* key);
bool BoolOf(const Json::Value& object, const char* key);

}  // namespace ferrox::cli
