#include "services/kovacontentextractd/readers/photo/heif.h"

#include <algorithm>
#include <cstdint>

#include "services/kovacontentextractd/readers/big_endian.h"

namespace ferrox::extract {

namespace {

using namespace std::literals;

// HEIF and AVIF are rows of boxes (ISO 14496-12): size with this head (4 bytes, 1 for a size of 8 bytes behind the
// name, 0 for the rest), name (4), content. The box "meta" has the boxes "iinf", the list of items with their types,
// and "iloc", where in the file the bytes of each item are. EXIF is an item of the type "Exif", XMP one of the type
// "mime". A box whose content begins with 4 bytes of version (1) and flags (3) is a full box.

/// Of EXIF or XMP, what is taken.
constexpr size_t kPartMaxBytes = 4U << 20;

/// Numbers off the beginning of what is left; 0 behind its end.
class Bytes {
 public:
  explicit Bytes(std::string_view rest) : rest_(rest) {}
  bool Ended() const { return rest_.empty(); }
  std::string_view Rest() const { return rest_; }
  uint64_t Number(size_t size) {
    const uint64_t value = BigEndian(rest_, 0, size);
    (void)Take(size);
    return value;
  }
  std::string_view Take(uint64_t count) {
    const std::string_view taken = rest_.substr(0, static_cast<size_t>(std::min<uint64_t>(count, rest_.size())));
    rest_.remove_prefix(taken.size());
    return taken;
  }
  std::string_view TakeText() {
    const std::string_view text = rest_.substr(0, rest_.find('\0'));
    (void)Take(text.size() + 1);
    return text;
  }

 private:
  std::string_view rest_;
};

struct Box {
  std::string_view name;
  std::string_view content;
};

/// The next one of a row of boxes: its size with this head, its name, its content.
Box TakeBox(Bytes& bytes) {
  uint64_t size = bytes.Number(4), head = 8;
  const std::string_view name = bytes.Take(4);
  if (size == 1) {
    size = bytes.Number(8);
    head = 16;
  }
  if (size == 0) return {name, bytes.Take(bytes.Rest().size())};
  return {name, bytes.Take(size > head ? size - head : 0)};
}

/// The content of the first box of this name in a row of boxes.
std::string_view ContentOf(std::string_view boxes, std::string_view name) {
  for (Bytes bytes(boxes); !bytes.Ended();) {
    const Box box = TakeBox(bytes);
    if (box.name == name) return box.content;
  }
  return {};
}

/// The number of the item that holds EXIF or XMP; 0, which none has, where the list has no such item. An entry ("infe")
/// is a full box: number (2 bytes, 4 in version 3), protection (2), type (4), name; for "mime", the type of content.
uint64_t ItemNumber(std::string_view list, bool is_exif) {
  Bytes bytes(list);
  const uint64_t version = bytes.Number(4) >> 24;
  (void)bytes.Number(version == 0 ? 2 : 4);
  while (!bytes.Ended()) {
    Bytes entry(TakeBox(bytes).content);
    const uint64_t entry_version = entry.Number(4) >> 24;
    const uint64_t number = entry.Number(entry_version == 3 ? 4 : 2);
    (void)entry.Number(2);
    const std::string_view type = entry.Take(4);
    (void)entry.TakeText();
    if (is_exif ? type == "Exif"sv : type == "mime"sv && entry.TakeText() == "application/rdf+xml"sv) return number;
  }
  return 0;
}

/// The bytes of an item, which may lie in several pieces of the file, or from version 1 on in the box "idat". The list
/// says first, in 4 bits each, how many bytes its offsets, lengths, bases and indices have.
std::string ItemBytes(std::string_view file, std::string_view meta, uint64_t wanted) {
  Bytes places(ContentOf(meta, "iloc"sv));
  const uint64_t version = places.Number(4) >> 24, sizes = places.Number(2);
  const size_t offset_size = sizes >> 12 & 15, length_size = sizes >> 8 & 15, base_size = sizes >> 4 & 15;
  const size_t index_size = version == 0 ? 0 : sizes & 15;
  for (uint64_t left = places.Number(version < 2 ? 2 : 4); left > 0 && !places.Ended(); --left) {
    const uint64_t number = places.Number(version < 2 ? 2 : 4);
    const bool in_data_box = version > 0 && (places.Number(2) & 15) == 1;
    (void)places.Number(2);
    const uint64_t base = places.Number(base_size);
    const uint64_t count = places.Number(2);
    // With all three sizes 0 the pieces take no bytes in the box, whatever `count` is.
    Bytes pieces(places.Take(count * (index_size + offset_size + length_size)));
    if (number != wanted) continue;
    const std::string_view from = in_data_box ? ContentOf(meta, "idat"sv) : file;
    std::string bytes;
    while (!pieces.Ended() && bytes.size() <= kPartMaxBytes) {
      (void)pieces.Number(index_size);
      const uint64_t at = base + pieces.Number(offset_size), length = pieces.Number(length_size);
      if (at >= from.size()) continue;
      bytes += from.substr(static_cast<size_t>(at), static_cast<size_t>(std::min<uint64_t>(length, kPartMaxBytes)));
    }
    return bytes;
  }
  return {};
}

}  // namespace

HeifParts ReadHeifParts(std::string_view file) {
  HeifParts parts;
  if (file.substr(std::min<size_t>(4, file.size()), 4) != "ftyp"sv) return parts;
  std::string_view meta = ContentOf(file, "meta"sv);
  meta.remove_prefix(std::min<size_t>(4, meta.size()));
  const std::string_view list = ContentOf(meta, "iinf"sv);
  if (const uint64_t number = ItemNumber(list, true)) {
    const std::string exif = ItemBytes(file, meta, number);
    const uint64_t head = 4 + BigEndian(exif, 0, 4);  // how far the TIFF head is behind these 4 bytes
    if (head < exif.size()) parts.exif = exif.substr(static_cast<size_t>(head));
  }
  if (const uint64_t number = ItemNumber(list, false)) parts.xmp = ItemBytes(file, meta, number);
  return parts;
}

}  // namespace ferrox::extract
