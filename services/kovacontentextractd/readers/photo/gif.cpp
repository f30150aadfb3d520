#include "services/kovacontentextractd/readers/photo/gif.h"

#include <algorithm>

namespace ferrox::extract {

namespace {

using namespace std::literals;

// A GIF file: "GIF89a" and the size of the screen (10 bytes), flags of the screen (1), two more bytes, a table of
// colours; then blocks, each with a kind in its first byte: 21 extension, 2C picture, 3B the end. What an extension or
// a picture holds is cut into pieces of up to 255 bytes. Of the extensions, FE is a comment and FF is of a program,
// whose name of 11 bytes is the first piece.

/// What is left of the file, read from its beginning. A film may go on for long: what describes it stands at its
/// beginning.
class Blocks {
 public:
  explicit Blocks(std::string_view file) : rest_(file.substr(0, kLookedAtBytes)) {}

  bool Ended() const { return rest_.empty(); }
  std::string_view Rest() const { return rest_; }
  uint8_t Byte() { return rest_.empty() ? 0 : static_cast<uint8_t>(Take(1)[0]); }
  std::string_view Take(size_t count) {
    const std::string_view taken = rest_.substr(0, count);
    rest_.remove_prefix(taken.size());
    return taken;
  }
  /// Passes a table of colours, which `flags` (of the screen or a picture) announce: 3 bytes for each of 2^(n+1)
  /// colours, n being the low 3 bits.
  void PassColours(uint8_t flags) {
    if ((flags & 0x80) != 0) (void)Take(3U << ((flags & 7) + 1));
  }
  /// The pieces that follow, joined; each begins with its length, and the last one is empty.
  std::string Pieces() {
    std::string all;
    for (size_t length = Byte(); length > 0 && !Ended(); length = Byte()) {
      const std::string_view piece = Take(length);
      if (all.size() < kTextMaxBytes) all.append(piece);
    }
    return all;
  }

 private:
  static constexpr size_t kLookedAtBytes = 4U << 20;
  static constexpr size_t kTextMaxBytes = 64U << 10;
  std::string_view rest_;
};

/// The packet of XMP at the beginning of `rest`, up to its own end mark. It is not cut into pieces; behind it stand 258
/// bytes that lead a reader of pieces to the end, whichever byte of the packet it took for a length.
std::string XmpAt(std::string_view rest) {
  const size_t end = rest.find("<?xpacket end"sv);
  return end == std::string_view::npos ? std::string() : std::string(rest.substr(0, end));
}

/// An extension, behind its first byte.
void ReadExtension(Blocks& blocks, GifTexts& texts) {
  constexpr uint8_t kComment = 0xFE, kApplication = 0xFF;
  const uint8_t label = blocks.Byte();
  if (label == kApplication && blocks.Rest().substr(1, 11) == "XMP DataXMP"sv) {
    texts.xmp = XmpAt(blocks.Rest().substr(std::min<size_t>(12, blocks.Rest().size())));
  }
  const std::string pieces = blocks.Pieces();
  if (label == kComment) texts.comment += (texts.comment.empty() ? "" : "\n") + pieces;
}

}  // namespace

GifTexts ReadGifTexts(std::string_view file) {
  constexpr uint8_t kExtension = 0x21, kPicture = 0x2C;
  constexpr size_t kTextsMaxBytes = 256U << 10;
  GifTexts texts;
  Blocks blocks(file);
  (void)blocks.Take(10);
  const uint8_t screen = blocks.Byte();
  (void)blocks.Take(2);
  blocks.PassColours(screen);
  while (!blocks.Ended() && texts.comment.size() < kTextsMaxBytes) {
    const uint8_t kind = blocks.Byte();
    if (kind == kExtension) {
      ReadExtension(blocks, texts);
    } else if (kind == kPicture) {
      (void)blocks.Take(8);
      blocks.PassColours(blocks.Byte());
      (void)blocks.Byte();
      (void)blocks.Pieces();
    } else {
      break;  // the end, or damage
    }
  }
  return texts;
}

}  // namespace ferrox::extract
