#pragma once

#include <cstdint>
#include <string_view>

namespace ferrox::fileindex {

/// The members of one queue line. The texts lie in the line and live as long as it does.
struct EventFields {
  uint32_t event = 0;
  bool is_dir = false;
  std::string_view path;
  std::string_view path_old;
};

/// Reads a queue line of the plain form: one object of the five known members in any order, each at most once, "event"
/// a natural number, texts without escapes and control characters, "data" null. Nearly every line has it.
/// @return false for any other line, good or bad: the JSON library is then to decide. Where it is true, the JSON
/// library reads the same members.
bool ScanPlainEvent(std::string_view line, EventFields& fields);

}  // namespace ferrox::fileindex
