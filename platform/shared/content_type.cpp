#include <algorithm>
#include <initializer_list>
#include <iterator>
#include <string>

#include <kova/content_type.h>

namespace kova::content {

namespace {

struct MarkRow {
  size_t offset;
  std::string_view mark;
  const char* type;
  /// The beginnings of the types whose files have this mark, with blanks between; a name that says one of them is
  /// right.
  std::string_view holds = {};
  /// Ordinary text may begin so.
  bool weak = false;
};

using namespace std::literals;

constexpr MarkRow kMarks[] = {
    {0, "\x7f\x45LF"sv, "application/x-executable", "application/x-"},
    {0, "%PDF-"sv, "application/pdf"},
    {0, "\x89PNG\r\n"sv, "image/png"},
    {0, "\xff\xd8\xff"sv, "image/jpeg"},
    {0, "GIF8"sv, "image/gif", {}, true},
    {0, "II*\0"sv, "image/tiff", "image/"},
    {0, "MM\0*"sv, "image/tiff", "image/"},
    {0, "II+\0"sv, "image/tiff", "image/"},
    {0, "MM\0+"sv, "image/tiff", "image/"},
    {0, "IIRO\x08\0"sv, "image/x-raw"},
    {0, "IIRS\x08\0"sv, "image/x-raw"},
    {0, "MMOR\0"sv, "image/x-raw"},
    {0, "IIU\0"sv, "image/x-raw"},
    {0, "FUJIFILMCCD-RAW"sv, "image/x-raw"},
    {6, "HEAPCCDR"sv, "image/x-raw"},
    {0, "\0MRM"sv, "image/x-raw"},
    {0, "FOVb"sv, "image/x-sigma-x3f", {}, true},
    {0, "8BPS\0"sv, "image/vnd.adobe.photoshop"},
    {8, "WEBPVP8"sv, "image/webp", {}, true},
    {0, "\0\0\0\x0cjP  \r\n\x87\n"sv, "image/jp2"},
    {0, "\xff\x4f\xff\x51\0"sv, "image/x-jp2-codestream"},
    {0, "\0\0\0\x0cJXL \r\n\x87\n"sv, "image/jxl"},
    {0, "\0\0\1\0\1\0"sv, "image/vnd.microsoft.icon"},
    {0, "P1\n"sv, "image/x-portable-anymap", {}, true},
    {0, "P2\n"sv, "image/x-portable-anymap", {}, true},
    {0, "P3\n"sv, "image/x-portable-anymap", {}, true},
    {0, "P4\n"sv, "image/x-portable-anymap"},
    {0, "P5\n"sv, "image/x-portable-anymap"},
    {0, "P6\n"sv, "image/x-portable-anymap"},
    {0, "v/1\1"sv, "image/x-exr"},
    {0, "#?RADIANCE\n"sv, "image/vnd.radiance"},
    {0, "SIMPLE  =    "sv, "image/fits", {}, true},
    {0, "AT&TFORM"sv, "image/vnd.djvu", {}, true},
    {0, "gimp xcf "sv, "image/x-xcf", {}, true},
    {128, "DICM"sv, "application/dicom", {}, true},
    {0, "PK\3\4"sv, "application/zip",
     "application/vnd.openxml application/vnd.oasis application/vnd.android application/vnd.visio application/epub "
     "application/java application/x- image/openraster"},
    {0, "\x1f\x8b\x08"sv, "application/gzip", "application/x-"},
    {0, "BZh"sv, "application/x-bzip2", {}, true},
    {0, "\xfd\x37zXZ\0"sv, "application/x-xz"},
    {0, "\x28\xb5\x2f\xfd"sv, "application/zstd"},
    {0, "\x1f\x9d"sv, "application/x-compress"},
    {0, "\x04\x22\x4d\x18"sv, "application/x-lz4"},
    {0, "LZIP\1"sv, "application/x-lzip"},
    {0, "\x89LZO\0"sv, "application/x-lzop"},
    {2, "-lh"sv, "application/x-lha", {}, true},
    {0, "MSCF\0\0\0\0"sv, "application/vnd.ms-cab-compressed", "application/"},
    {0, "\xed\xab\xee\xdb"sv, "application/x-rpm"},
    {0, "070701"sv, "application/x-cpio", {}, true},
    {0, "070702"sv, "application/x-cpio", {}, true},
    {0, "070707"sv, "application/x-cpio", {}, true},
    {0, "\xc7\x71"sv, "application/x-cpio"},
    {0, "7z\xbc\xaf\x27\x1c"sv, "application/x-7z-compressed"},
    {0, "Rar!\x1a\x07"sv, "application/vnd.rar"},
    {257, "ustar"sv, "application/x-tar", {}, true},
    {0, "SQLite format 3\0"sv, "application/x-sqlite3", "application/"},
    {0, "\xd0\xcf\x11\xe0\xa1\xb1\x1a\xe1"sv, "application/x-ole-storage",
     "application/vnd.ms- application/vnd.visio application/msword application/x-"},
    {0, "!<arch>\n"sv, "application/x-archive", "application/"},
    // Where the name of the codec is in the first page.
    {28, "\x80theora"sv, "video/ogg"},
    {28, "\1video\0"sv, "video/ogg"},
    {28, "fishead\0"sv, "video/ogg", "audio/ video/"},
    {0, "OggS"sv, "audio/ogg", "audio/ video/", true},
    {0, "fLaC"sv, "audio/flac", {}, true},
    {0, "ID3"sv, "audio/mpeg", "audio/ video/", true},
    {0, "\xff\xfb"sv, "audio/mpeg", "audio/ video/"},
    {0, "\xff\xfa"sv, "audio/mpeg", "audio/ video/"},
    {0, "\xff\xf3"sv, "audio/mpeg", "audio/ video/"},
    {0, "\xff\xf2"sv, "audio/mpeg", "audio/ video/"},
    {0, "\xff\xfd"sv, "audio/mpeg", "audio/ video/"},
    {0, "\xff\xf1"sv, "audio/aac", "audio/"},
    {0, "\xff\xf9"sv, "audio/aac", "audio/"},
    {0, "\x0b\x77"sv, "audio/ac3", "audio/"},
    {0, "\x7f\xfe\x80\1"sv, "audio/vnd.dts", "audio/"},
    {0, "MAC \x96\x0f"sv, "audio/x-ape"},
    {0, "wvpk"sv, "audio/x-wavpack", {}, true},
    {0, "MPCK"sv, "audio/x-musepack", {}, true},
    {0, "MP+\x07"sv, "audio/x-musepack"},
    {0, "TTA1"sv, "audio/x-tta", {}, true},
    {0, ".snd\0"sv, "audio/basic"},
    {0, "MThd\0"sv, "audio/midi"},
    {0, "caff\0"sv, "audio/x-caf"},
    {0, "#!AMR\n"sv, "audio/amr"},
    {0, "#!AMR-WB\n"sv, "audio/amr-wb"},
    {0, "FRM8\0"sv, "audio/x-dff"},
    {0, ".ra\xfd"sv, "audio/vnd.rn-realaudio"},
    {0, "RF64"sv, "audio/x-rf64", {}, true},
    {8, "WAVEfmt "sv, "audio/x-wav", "audio/", true},
    {8, "AIFC"sv, "audio/x-aiff", "audio/", true},
    {8, "AIFF"sv, "audio/x-aiff", "audio/", true},
    {0, "DSD \x1c\0\0\0"sv, "audio/x-dsd"},
    {4, "ftypM4A"sv, "audio/mp4", "audio/ video/", true},
    {4, "ftypM4B"sv, "audio/mp4", "audio/ video/", true},
    {4, "ftypM4P"sv, "audio/mp4", "audio/ video/", true},
    {4, "ftyp3g"sv, "video/3gpp", "video/ audio/", true},
    {4, "ftyphei"sv, "image/heic", "image/", true},
    {4, "ftypmif1"sv, "image/heic", "image/", true},
    {4, "ftypmsf1"sv, "image/heic", "image/", true},
    {4, "ftyphevc"sv, "image/heic", "image/", true},
    {4, "ftypavif"sv, "image/avif", "image/", true},
    {4, "ftypavis"sv, "image/avif", "image/", true},
    {4, "ftypcrx"sv, "image/x-raw", "image/", true},
    {4, "ftypqt"sv, "video/quicktime", "video/", true},
    {4, "ftyp"sv, "video/mp4", "video/ audio/ image/", true},
    {0, "\x1a\x45\xdf\xa3"sv, "video/x-matroska", "video/ audio/"},
    {8, "AVI LIST"sv, "video/x-msvideo", "video/", true},
    {0, "\x30\x26\xb2\x75\x8e\x66\xcf\x11"sv, "video/x-ms-wmv", "video/ audio/"},
    {0, "FLV\1"sv, "video/x-flv"},
    {0, ".RMF\0"sv, "application/vnd.rn-realmedia"},
    {0, "\0\0\1\xba"sv, "video/mpeg", "video/ audio/"},
    {0, "\0\0\1\xb3"sv, "video/mpeg", "video/"},
    {0, "\xca\xfe\xba\xbe"sv, "application/java-vm", "application/"},
    {0, "\0asm"sv, "application/wasm"},
    {0, "{\\rtf"sv, "application/rtf"},
    {0, "<!DOCTYPE html"sv, "text/html", {}, true},
    {0, "<!doctype html"sv, "text/html", {}, true},
    {0, "<html"sv, "text/html", {}, true},
    {0, "<HTML"sv, "text/html", {}, true},
    {0, "<?xml"sv, "application/xml", {}, true},
};

/// What the first members of a ZIP file make of it.
const char* TypeOfZip(std::string_view head) {
  constexpr size_t kFirstName = 30;
  constexpr std::string_view kTypeMember = "mimetype";
  const std::string_view first = head.substr(std::min(kFirstName, head.size()));
  if (first.substr(0, kTypeMember.size()) == kTypeMember) {
    const char* said = TypeAtBeginning(first.substr(kTypeMember.size()));
    if (said != nullptr) return said;
  }
  const bool is_office = head.find("[Content_Types].xml"sv) != std::string_view::npos;
  if (!is_office) return "application/zip";
  if (head.find("xl/"sv) != std::string_view::npos) return TypeByExtension("xlsx");
  return TypeByExtension(head.find("ppt/"sv) != std::string_view::npos ? "pptx" : "docx");
}

/// The packets of a film for broadcast, of 188 bytes each, alone or behind a time of 4 bytes.
bool IsTransportStream(std::string_view head) {
  constexpr size_t kPacketsMin = 5;
  for (const size_t offset : {size_t{0}, size_t{4}}) {
    size_t at = offset, packets = 0;
    for (; at < head.size() && head[at] == 'G'; at += 188 + offset) ++packets;
    if (at >= head.size() && packets >= kPacketsMin) return true;
  }
  return false;
}

/// Without a mark of Unicode and blanks, which may stand before markup.
std::string_view FromFirstCharacter(std::string_view head) {
  if (head.substr(0, 3) == "\xEF\xBB\xBF"sv) head.remove_prefix(3);
  return head.substr(std::min(head.find_first_not_of(" \t\r\n"), head.size()));
}

const MarkRow* MarkOf(std::string_view head) {
  static constexpr MarkRow kTransportStream = {0, "G"sv, "video/mp2t", "video/"sv};
  if (IsTransportStream(head)) return &kTransportStream;
  const std::string_view markup = FromFirstCharacter(head);
  for (const MarkRow& row : kMarks) {
    const std::string_view text = row.mark[0] == '<' ? markup : head;
    if (text.size() >= row.offset && text.substr(row.offset, row.mark.size()) == row.mark) return &row;
  }
  return nullptr;
}

/// The name of the header that a line of a mail is, in lower case; empty when it is none.
std::string HeaderName(std::string_view line) {
  std::string name(line.substr(0, std::min(line.find(':'), line.size())));
  for (char& c : name) {
    if (c <= ' ' || c > '~') return {};
    if (c >= 'A' && c <= 'Z') c = static_cast<char>(c - 'A' + 'a');
  }
  return name.size() < line.size() ? name : std::string();
}

/// Mail often has no name that says so: in the folders of servers and programs, or saved by hand. Nothing but headers
/// up to an empty line, and among them such as each mail has.
bool IsMail(std::string_view head) {
  static constexpr std::string_view kUsual[] = {"from",       "date",         "subject",     "received",    "to",
                                                "message-id", "mime-version", "return-path", "content-type"};
  int usual = 0;
  for (size_t line_end = head.find('\n'); line_end != std::string_view::npos; line_end = head.find('\n')) {
    std::string_view line = head.substr(0, line_end);
    head.remove_prefix(line_end + 1);
    if (!line.empty() && line.back() == '\r') line.remove_suffix(1);
    if (line.empty()) break;
    if (line[0] == ' ' || line[0] == '\t') continue;
    const std::string name = HeaderName(line);
    if (name.empty()) return false;
    if (std::find(std::begin(kUsual), std::end(kUsual), name) != std::end(kUsual)) ++usual;
    if (name == "mime-version") ++usual;  // of a saved page there is little more
  }
  return usual >= 3;
}

/// A box of mails: "From", who, and when, on a day of the week; then the first mail.
bool IsMailBox(std::string_view head) {
  if (head.substr(0, 5) != "From "sv) return false;
  const size_t line_end = std::min(head.find('\n'), head.size());
  return head.substr(0, line_end).find(':') != std::string_view::npos &&
         IsMail(head.substr(std::min(line_end + 1, head.size())));
}

const char* TypeOfMail(std::string_view head) {
  if (IsMailBox(head)) return "application/mbox";
  return IsMail(head) ? "message/rfc822" : nullptr;
}

bool Holds(const MarkRow& mark, std::string_view type) {
  for (std::string_view left = mark.holds; !left.empty();) {
    const std::string_view prefix = left.substr(0, left.find(' '));
    if (type.substr(0, prefix.size()) == prefix) return true;
    left.remove_prefix(std::min(prefix.size() + 1, left.size()));
  }
  return mark.type == type;
}

bool IsReadBy(std::initializer_list<std::string_view> readers, std::string_view type) {
  const Format* format = FormatOf(type);
  return format != nullptr && std::find(readers.begin(), readers.end(), format->reader) != readers.end();
}

bool IsText(std::string_view type) { return IsReadBy({"plain", "html", "xml"}, type); }

bool IsMedia(std::string_view type) {
  const std::string_view kind = type.substr(0, 6);
  return (kind == "image/"sv || kind == "audio/"sv || kind == "video/"sv) && !IsText(type);
}

/// Whether a file without any mark cannot be what its name says, but may be text.
bool IsTextUnderAnotherName(std::string_view type, std::string_view head) {
  const auto in_no_text = [](unsigned char c) { return c < ' ' && c != '\t' && c != '\n' && c != '\r' && c != '\f'; };
  if (IsMedia(type)) return std::none_of(head.begin(), head.end(), in_no_text);
  return IsReadBy({"pdf", "office", "open-document", "book", "old-office", "rich-text"}, type) &&
         head.find('\0') == std::string_view::npos && head.find("%PDF-"sv) == std::string_view::npos;
}

}  // namespace

const char* TypeOf(std::string_view extension, std::string_view head) {
  const char* by_name = TypeByExtension(extension);
  const MarkRow* mark = MarkOf(head);
  if (mark == nullptr) {
    const bool is_other = by_name != nullptr && IsTextUnderAnotherName(by_name, head);
    if (by_name != nullptr && !is_other) return by_name;
    const char* mail = TypeOfMail(head);
    return mail != nullptr || by_name == nullptr ? mail : "text/plain";
  }
  const char* by_mark = mark->type == "application/zip"sv ? TypeOfZip(head) : mark->type;
  if (by_name == nullptr) return by_mark;
  const bool is_binary = head.find('\0') != std::string_view::npos;
  if (IsText(by_name)) return mark->weak && !is_binary ? by_name : by_mark;
  return Holds(*mark, by_name) ? by_name : by_mark;
}

}  // namespace kova::content
