#include "services/kovaelasticd/text/clean.h"

#include "base/text.h"
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
    const bool invalid = c.value >= 0x80 && c.length_bytes == 1;
    if (invalid) {
      out += kReplacement;
    } else if (c.value == ' ' || base::ControlCodePoint(bytes) >= 0) {
      if (!out.empty() && out.back() != ' ') out += ' ';
    } else {
      out += bytes;
    }
  }
}

}  // namespace ferrox::engine
