#include "cli/escape.h"

#include <cstdint>
#include <cstdio>

#include "common/json_util.h"

namespace ferrox::cli {

namespace {

bool IsContinuation(unsigned char byte) { return (byte & 0xC0) == 0x80; }

std::string Formatted(const char* format, unsigned char byte) {
  char text[8];
  (void)snprintf(text, sizeof(text), format, byte);
  return text;
}

/// C0, DEL and the C1 controls that some terminals obey, and the characters that turn the direction of the text.
bool IsControl(std::string_view character) {
  const auto first = static_cast<unsigned char>(character[0]);
  if (character.size() == 1) return first < 0x20 || first == 0x7F;
  if (first == 0xC2) return static_cast<unsigned char>(character[1]) < 0xA0;
  if (character.size() != 3 || first != 0xE2) return false;
  const uint32_t tail = static_cast<unsigned char>(character[1]) << 8 | static_cast<unsigned char>(character[2]);
  return (tail >= 0x80AA && tail <= 0x80AE) || (tail >= 0x81A6 && tail <= 0x81A9) || tail == 0x80A8 || tail == 0x80A9;
}

}  // namespace

size_t Utf8Length(std::string_view text) {
  if (text.empty()) return 0;
  const auto byte = [&text](size_t at) { return static_cast<unsigned char>(text[at]); };
  const unsigned char first = byte(0);
  if (first < 0x80) return 1;
  const size_t length = first >= 0xF0 ? 4 : first >= 0xE0 ? 3 : 2;
  if (first < 0xC2 || first > 0xF4 || text.size() < length) return 0;
  for (size_t i = 1; i < length; ++i) {
    if (!IsContinuation(byte(i))) return 0;
  }
  // Overlong forms, surrogates, and what lies beyond the last character.
  const unsigned char second = byte(1);
  const bool refused = (first == 0xE0 && second < 0xA0) || (first == 0xED && second > 0x9F) ||
                       (first == 0xF0 && second < 0x90) || (first == 0xF4 && second > 0x8F);
  return refused ? 0 : length;
}

std::string EscapeForTerminal(std::string_view text) {
  std::string safe;
  safe.reserve(text.size());
  while (!text.empty()) {
    const size_t length = Utf8Length(text);
    const size_t taken = length == 0 ? 1 : length;
    if (length != 0 && !IsControl(text.substr(0, length))) {
      safe += text.substr(0, length);
    } else {
      for (const char byte : text.substr(0, taken)) safe += Formatted("\\x%02X", static_cast<unsigned char>(byte));
    }
    text.remove_prefix(taken);
  }
  return safe;
}

std::string EscapeOneLine(std::string_view text) {
  std::string line;
  for (const char byte : text) {
    const bool blank = byte == ' ' || (byte >= '\t' && byte <= '\r');
    if (!blank) {
      line += byte;
    } else if (line.empty() || line.back() != ' ') {
      line += ' ';
    }
  }
  return EscapeForTerminal(line);
}

std::string ToScriptJson(const Json::Value& value) {
  const std::string raw = toString(value);
  std::string_view text = raw;
  std::string json;
  json.reserve(text.size());
  while (!text.empty()) {
    const size_t length = Utf8Length(text);
    if (length != 0) {
      json += text.substr(0, length);
    } else {
      json += Formatted("\\udc%02x", static_cast<unsigned char>(text[0]));
    }
    text.remove_prefix(length == 0 ? 1 : length);
  }
  return json;
}

}  // namespace ferrox::cli
