#include "services/kovaelasticd/text/clean.h"

#include "services/kovaelasticd/text/fold.h"

namespace ferrox::engine {

namespace {

constexpr char kReplacement[] = "\xEF\xBF\xBD";

}  // namespace

void AppendClean(std::string& out, std::string_view text) {
  for (size_t pos = 0; pos < text.size();) {
    const CodePoint c = DecodeAt(text, pos);
    const std::string_view bytes = text.substr(pos, c.length_bytes);
    pos += c.length_bytes;
    const bool control = c.value < 0x21 || (c.value >= 0x7F && c.value <= 0x9F && c.length_bytes == 2) ||
                         c.value == 0x7F || (c.value >= 0x202A && c.value <= 0x202E) ||
                         (c.value >= 0x2066 && c.value <= 0x2069);
    if (control) {
      if (!out.empty() && out.back() != ' ') out += ' ';
    } else if (c.value >= 0x80 && c.length_bytes == 1) {
      out += kReplacement;
    } else {
      out += bytes;
    }
  }
}

}  // namespace ferrox::engine
