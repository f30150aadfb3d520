#include <algorithm>
#include <string>

#include "services/kovacontentextractd/readers/code_pages.h"
#include "services/kovacontentextractd/readers/little_endian.h"
#include "services/kovacontentextractd/readers/old_office_parts.h"
#include "services/kovacontentextractd/readers/utf8.h"

namespace ferrox::extract {

namespace {

// The stream "WordDocument" of Word 6 to 2003 begins with a header (FIB): version (at 02), flags (at 0A: 0004 saved
// fast, 0100 encrypted, 0200 which of the two table streams counts, 1000 characters of two bytes before Word 97),
// beginning and end of the text (at 18 and 1C). The text is a row of pieces, listed in a table: that of Word 97 lies in
// the stream "0Table" or "1Table" at the place and with the size at 1A2 and 1A6, that of Word 6 and 95 in the document
// itself (at 160 and 164) and only where the file was saved fast, which appends changes. Read is the whole text, with
// footnotes, headers and comments, which follow the main text in the same numbering of characters.
constexpr size_t kWordHeaderBytes = 1024;
constexpr size_t kPieceBytes = 32U << 10;
/// Of a table of pieces, what is read: 700,000 pieces.
constexpr uint32_t kPieceTableMax = 8U << 20;
/// Of all pieces: they may overlap, and hold nothing.
constexpr uint64_t kCharactersMaxBytes = 64U << 20;

/// Makes text of Word's characters. Below the blank they are marks: 0D ends a paragraph, 0B a line, 0C a page, 07 a
/// cell of a table, 1E is a hyphen that does not break. A field is 13, its instructions ("HYPERLINK ..."), 14, what it
/// shows, 15; fields nest, and only what is shown is text.
class WordText {
 public:
  explicit WordText(Findings& findings) : findings_(findings) {}
  ~WordText() { Flush(); }
  WordText(const WordText&) = delete;
  WordText& operator=(const WordText&) = delete;

  /// False when the findings take no more.
  bool Add(uint32_t code) {
    constexpr uint32_t kFieldBegin = 0x13, kFieldSeparator = 0x14, kFieldEnd = 0x15;
    if (code == kFieldBegin) instructions_ = std::min(instructions_ + 1, 1000);
    if ((code == kFieldSeparator || code == kFieldEnd) && instructions_ > 0) --instructions_;
    if (instructions_ > 0) return true;
    if (code == '\r' || code == 0x0B || code == 0x0C) {
      text_ += '\n';
    } else if (code == 0x07 || code == '\t') {
      text_ += '\t';
    } else if (code == 0x1E) {
      text_ += '-';
    } else if (code >= ' ') {
      AppendUtf8(text_, code);
    }
    return text_.size() < kPieceBytes || Flush();
  }

  /// What has no marks in it.
  bool AddPlain(std::string_view utf8) {
    if (instructions_ == 0) text_ += utf8;
    return text_.size() < kPieceBytes || Flush();
  }

  bool Flush() {
    const bool more = findings_.AddText(text_);
    text_.clear();
    return more;
  }

 private:
  Findings& findings_;
  std::string text_;
  int instructions_ = 0;  ///< fields whose instructions we are in
};

/// Adds text in the encoding of its country, as it was before Word 97. Characters below the blank are marks.
bool AddEncoded(std::string_view bytes, int code_page, WordText& text) {
  while (!bytes.empty()) {
    const auto is_mark = [](char c) { return static_cast<unsigned char>(c) < ' '; };
    const auto length = static_cast<size_t>(std::find_if(bytes.begin(), bytes.end(), is_mark) - bytes.begin());
    if (length > 0 && !text.AddPlain(FromCodePage(bytes.substr(0, length), code_page))) return false;
    if (length < bytes.size() && !text.Add(static_cast<unsigned char>(bytes[length]))) return false;
    bytes.remove_prefix(std::min(length + 1, bytes.size()));
  }
  return true;
}

/// Adds `size` bytes of text at `offset`, of one or two bytes a character.
bool AddPiece(const CompoundStream& document, uint64_t offset, uint64_t size, bool wide, int code_page,
              WordText& text) {
  const uint64_t end = std::min(offset + size, document.Size());
  while (offset < end) {
    const std::string bytes =
        document.ReadAt(offset, static_cast<size_t>(std::min<uint64_t>(kPieceBytes, end - offset)));
    if (bytes.empty()) return true;
    offset += bytes.size();
    if (!wide) {
      if (!AddEncoded(bytes, code_page, text)) return false;
      continue;
    }
    for (size_t i = 0; i + 2 <= bytes.size(); i += 2) {
      uint32_t code = Little16(bytes, i);
      if (code >= 0xD800 && code <= 0xDBFF && (Little16(bytes, i + 2) & 0xFC00) == 0xDC00) {
        code = 0x10000 + ((code & 0x3FF) << 10) + (Little16(bytes, i + 2) & 0x3FFU);
        i += 2;
      }
      if (!text.Add(code)) return false;
    }
  }
  return true;
}

/// How a document has its characters.
struct Form {
  bool is_97 = true;     ///< Word 97 or later, where each piece tells how wide its characters are
  bool wide = true;      ///< two bytes a character
  int code_page = 1252;  ///< of narrow ones
};

/// Before Word 97 the narrow characters are those of the writer's country; where that is in East Asia, they are wide.
Form FormOf(const CompoundFile& file, const std::string& header) {
  constexpr uint16_t kWord97 = 0x00C1, kExtendedCharacters = 0x1000;
  if (Little16(header, 2) >= kWord97) return {};
  return {false, (Little16(header, 0x0A) & kExtendedCharacters) != 0, SummaryCodePage(file)};
}

/// The table of the pieces that the text is made of ("Clx"): first any number of changes to formats, each a byte 01, a
/// size of 2 bytes and as many bytes; then a byte 02, a size of 4 bytes and the table.
std::string PieceTable(const CompoundStream& stream, uint32_t offset, uint32_t size) {
  const std::string clx = stream.ReadAt(offset, std::min(size, kPieceTableMax));
  size_t at = 0;
  while (at + 3 <= clx.size() && clx[at] == 1) at += 3 + size_t{Little16(clx, at + 1)};
  return at + 5 <= clx.size() && clx[at] == 2 ? clx.substr(at + 5, Little32(clx, at + 1)) : std::string();
}

std::string PieceTable97(const CompoundFile& file, const std::string& header) {
  const bool one = (Little16(header, 0x0A) & 0x0200) != 0;
  const auto stream = file.Open(one ? "1Table" : "0Table");
  return stream != nullptr ? PieceTable(*stream, Little32(header, 0x1A2), Little32(header, 0x1A6)) : std::string();
}

/// Before Word 97 only a text that was saved fast is in pieces.
std::string PieceTable95(const CompoundStream& document, const std::string& header) {
  const bool saved_fast = (Little16(header, 0x0A) & 0x0004) != 0;
  return saved_fast ? PieceTable(document, Little32(header, 0x160), Little32(header, 0x164)) : std::string();
}

/// The table of n pieces: n + 1 positions of 4 bytes, in characters; then for each piece 8 bytes, in which the place in
/// the stream is at 2. In Word 97, bit 30 of a place says that its characters have one byte each, and that the place is
/// counted double.
void AddPieces(const CompoundStream& document, const std::string& table, const Form& form, Findings& findings) {
  constexpr size_t kPositionBytes = 4, kDescriptorBytes = 8;
  constexpr uint32_t kNarrow = 0x40000000;
  const size_t count =
      table.size() < kPositionBytes ? 0 : (table.size() - kPositionBytes) / (kPositionBytes + kDescriptorBytes);
  WordText text(findings);
  uint64_t read = 0;
  for (size_t i = 0; i < count && read < kCharactersMaxBytes; ++i) {
    const uint32_t begin = Little32(table, i * kPositionBytes), end = Little32(table, (i + 1) * kPositionBytes);
    const uint32_t place = Little32(table, (count + 1) * kPositionBytes + i * kDescriptorBytes + 2);
    if (end <= begin) continue;
    const bool is_narrow = form.is_97 && (place & kNarrow) != 0;
    const bool wide = form.wide && !is_narrow;
    const uint64_t offset = is_narrow ? (place & ~kNarrow) / 2 : place;
    const uint64_t left = document.Size() - std::min(offset, document.Size());
    const uint64_t size = std::min({uint64_t{end - begin} * (wide ? 2 : 1), left, kCharactersMaxBytes - read});
    read += size;
    if (!AddPiece(document, offset, size, wide, form.code_page, text)) return;
  }
}

}  // namespace

void ReadOldWord(const CompoundFile& file, Findings& findings) {
  const auto document = file.Open("WordDocument");
  const std::string header = document->ReadAt(0, kWordHeaderBytes);
  if (header.size() < 0x20) return findings.Fail("damaged");
  if ((Little16(header, 0x0A) & 0x0100) != 0) return findings.Fail("encrypted");
  const Form form = FormOf(file, header);
  const std::string table = form.is_97 ? PieceTable97(file, header) : PieceTable95(*document, header);
  if (!table.empty()) return AddPieces(*document, table, form, findings);
  // Where the table is lost, and without one: the text stands in one piece.
  const uint32_t begin = Little32(header, 0x18), end = Little32(header, 0x1C);
  if (end <= begin) return findings.Fail("damaged");
  WordText text(findings);
  (void)AddPiece(*document, begin, end - begin, form.wide && !form.is_97, form.code_page, text);
}

}  // namespace ferrox::extract
