#include "cli/escape.h"

#include <cstdio>

#include "base/text.h"
#include "common/json_util.h"

namespace ferrox::cli {

namespace {

/// How a byte is shown that is not: with a backslash, which names may contain, too. People see that something odd is
/// there; scripts take the JSON form.
constexpr char kShownByte[] = "\\x%02X";

/// "\u001b". Code points of more than 16 bits are not escaped; there are no control characters among them.
std::string JsonEscape(int code_point) {
  char text[8];
  (void)snprintf(text, sizeof(text), "\\u%04x", static_cast<unsigned>(code_point) & 0xFFFF);
  return text;
}

}  // namespace

std::string EscapeForTerminal(std::string_view text) { return base::WithoutControls(text, kShownByte); }

std::string EscapeText(std::string_view text) {
  std::string lines;
  for (size_t i = 0; i < text.size(); ++i) {
    if (text.compare(i, 2, "\r\n") != 0) lines += text[i];
  }
  return base::WithoutControls(lines, kShownByte, "\n\t");
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

/// The JSON library writes invalid UTF-8 as it is and escapes only the controls below 0x20; what it leaves is escaped
/// here, behind it, where only the bytes of strings can need it.
std::string ToScriptJson(const Json::Value& value) {
  constexpr int kLoneSurrogate = 0xDC00;
  const std::string raw = toString(value);
  std::string_view text = raw;
  std::string json;
  json.reserve(text.size());
  while (!text.empty()) {
    const size_t length = base::CharacterBytes(text);
    const std::string_view taken = text.substr(0, length == 0 ? 1 : length);
    const int control =
        length == 0 ? kLoneSurrogate + static_cast<unsigned char>(text[0]) : base::ControlCodePoint(taken);
    json += control < 0 ? std::string(taken) : JsonEscape(control);
    text.remove_prefix(taken.size());
  }
  return json;
}

}  // namespace ferrox::cli
