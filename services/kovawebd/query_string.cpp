#include "services/kovawebd/query_string.h"

#include <charconv>

#include "services/kovawebd/message.h"

namespace ferrox::web {

namespace {

constexpr size_t kParametersMax = 64;

/// As forms are coded: "+" is a blank.
std::string Decode(std::string_view text) {
  std::string decoded;
  decoded.reserve(text.size());
  for (size_t i = 0; i < text.size(); ++i) {
    if (text[i] != '%') {
      decoded += text[i] == '+' ? ' ' : text[i];
      continue;
    }
    unsigned char byte = 0;
    const std::string_view digits = text.substr(i + 1, 2);
    const auto read = std::from_chars(digits.data(), digits.data() + digits.size(), byte, 16);
    const bool whole = digits.size() == 2 && read.ec == std::errc() && read.ptr == digits.data() + 2;
    if (!whole || byte == 0) throw Problem{400, "\"%\" is followed by two hexadecimal digits, and not by 00"};
    decoded += static_cast<char>(byte);
    i += 2;
  }
  return decoded;
}

}  // namespace

Target ReadTarget(std::string_view target) {
  if (!target.starts_with('/')) throw Problem{400, "a request names a path that begins with \"/\""};
  if (target.find('\0') != std::string_view::npos) throw Problem{400, "a request has no zero byte"};
  const size_t mark = target.find('?');
  Target read{std::string(target.substr(0, mark)), {}};
  std::string_view rest = mark == std::string_view::npos ? "" : target.substr(mark + 1);
  while (!rest.empty()) {
    const std::string_view part = rest.substr(0, rest.find('&'));
    rest.remove_prefix(std::min(part.size() + 1, rest.size()));
    if (part.empty()) continue;
    if (read.parameters.size() == kParametersMax) throw Problem{400, "a request has at most 64 parameters"};
    const size_t equals = part.find('=');
    const std::string_view value = equals == std::string_view::npos ? "" : part.substr(equals + 1);
    read.parameters.emplace_back(Decode(part.substr(0, equals)), Decode(value));
  }
  return read;
}

}  // namespace ferrox::web
