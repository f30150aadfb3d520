#include "services/kovacontentextractd/readers/photo/png.h"

#include <algorithm>
#include <string_view>

#include "services/kovacontentextractd/readers/big_endian.h"
#include "services/kovacontentextractd/readers/byte_source.h"

namespace ferrox::extract {

namespace {

using namespace std::literals;

// A PNG file is a mark and chunks: size of the content (4 bytes, high byte first), name (4), content, check sum (4).
// All but those that hold the picture (IDAT, fdAT) are copied into a file that the library then reads: it would read a
// picture of hundreds of MiB otherwise.

constexpr std::string_view kMark = "\x89PNG\r\n\x1a\n"sv;
constexpr size_t kHeadBytes = 8;  // of a chunk: its size and name
constexpr size_t kCheckBytes = 4;
/// Of all chunks that are kept; a longer one is left out.
constexpr size_t kKeptMaxBytes = 16U << 20;
constexpr int kChunksMax = 200000;

/// The text up to the next zero, which is taken off with it.
std::string_view TakeText(std::string_view& rest) {
  const std::string_view text = rest.substr(0, rest.find('\0'));
  rest.remove_prefix(std::min(text.size() + 1, rest.size()));
  return text;
}

/// tEXt: keyword, text. iTXt: keyword, whether packed, how, language, translated keyword, text.
void AddText(std::string_view name, std::string_view content, PngParts& parts) {
  const std::string keyword(TakeText(content));
  if (name == "iTXt"sv) {
    if (content.substr(0, 1) != "\0"sv) return;
    content.remove_prefix(std::min<size_t>(2, content.size()));
    (void)TakeText(content);
    (void)TakeText(content);
  } else if (name != "tEXt"sv) {
    return;
  }
  parts.texts.emplace_back(keyword, content);
}

}  // namespace

PngParts ReadPngParts(const Source& source) {
  const FileBytes file(source);
  PngParts parts;
  if (file.ReadAt(0, kMark.size()) != kMark) return parts;
  parts.file = kMark;
  uint64_t at = kMark.size();
  for (int count = 0; count < kChunksMax; ++count) {
    const std::string head = file.ReadAt(at, kHeadBytes);
    if (head.size() < kHeadBytes) break;
    const std::string_view name = std::string_view(head).substr(4);
    const uint64_t size = BigEndian(head, 0, 4) + kHeadBytes + kCheckBytes;
    if (name != "IDAT"sv && name != "fdAT"sv && size <= kKeptMaxBytes - std::min(kKeptMaxBytes, parts.file.size())) {
      const size_t begin = parts.file.size();
      parts.file += file.ReadAt(at, static_cast<size_t>(size));
      if (parts.file.size() < begin + size) break;  // cut off
      AddText(name, std::string_view(parts.file).substr(begin + kHeadBytes, size - kHeadBytes - kCheckBytes), parts);
    }
    at += size;
  }
  return parts;
}

}  // namespace ferrox::extract
