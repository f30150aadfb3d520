#include "services/kovacontentextractd/readers/text_files.h"

#include <magic.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>

#include "services/kovacontentextractd/readers/converters.h"
#include "services/kovacontentextractd/readers/declared_encoding.h"
#include "services/kovacontentextractd/readers/encoding.h"
#include "services/kovacontentextractd/readers/markup.h"

namespace ferrox::extract {

namespace {

/// How much of a file is read. UTF-16 holds less text than it has bytes, and a saved page may hold its pictures.
constexpr size_t kReadMaxBytes = 2U << 20;
constexpr size_t kMarkupMaxBytes = 16U << 20;
/// How much of a file that is no text is read to find out its type.
constexpr size_t kMagicBytes = 64U << 10;

/// The library's table, loaded once before the sandbox closes; null when it could not be. Of the worker's one thread.
magic_t g_magic = nullptr;

/// The beginning of a file.
struct Head {
  std::string bytes;
  bool cut = false;
};

/// Reads the beginning of the file, which may have grown since its size was taken.
bool ReadHead(const Source& source, size_t max_bytes, Head& head) {
  size_t wanted = static_cast<size_t>(std::min<uint64_t>(source.size, max_bytes)) + 1;
  size_t have = 0;
  while (have <= max_bytes) {
    head.bytes.resize(wanted);
    const ssize_t got = pread(source.fd, head.bytes.data() + have, wanted - have, static_cast<off_t>(have));
    if (got < 0 && errno == EINTR) continue;
    if (got < 0) return false;
    if (got == 0) break;
    have += static_cast<size_t>(got);
    if (have == wanted) wanted = std::min(wanted * 2, max_bytes + 1);
  }
  head.cut = have > max_bytes;
  head.bytes.resize(std::min(have, max_bytes));
  return true;
}

using DeclaredEncoding = std::string (*)(std::string_view head);
using Markup = MarkupText (*)(std::string_view source, size_t limit_bytes);

std::string DeclaresNothing(std::string_view) { return {}; }

/// Decodes the bytes by their own marks and what `declared` finds in them, and adds their text: what `markup` leaves of
/// it, or all. False when the bytes are no text.
bool AddDecoded(const Head& head, DeclaredEncoding declared, Markup markup, Findings& findings) {
  DecodedText decoded;
  if (!Decode(head.bytes, head.cut, declared(head.bytes), decoded)) return false;
  findings.Set(field::k_KOVATextEncoding, decoded.encoding);
  if (markup == nullptr) {
    findings.AddText(decoded.text);
  } else {
    const MarkupText read = markup(decoded.text, findings.Bounds().text_bytes);
    findings.Set(field::kKOVAMDTitle, read.title);
    findings.AddText(read.text);
    if (read.cut) findings.MarkCut();
  }
  if (head.cut) findings.MarkCut();
  return true;
}

void ReadText(const Source& source, DeclaredEncoding declared, Markup markup, Findings& findings) {
  Head head;
  const size_t max_bytes = markup != nullptr ? kMarkupMaxBytes : kReadMaxBytes;
  if (!ReadHead(source, max_bytes, head)) return findings.Fail("cannot be read");
  if (!head.bytes.empty() && !AddDecoded(head, declared, markup, findings)) findings.Fail("not text");
}

/// What the system's table of file types knows of the bytes; empty when nothing.
std::string TypeByMagic(std::string_view bytes) {
  const char* type =
      g_magic == nullptr ? nullptr : magic_buffer(g_magic, bytes.data(), std::min(bytes.size(), kMagicBytes));
  const std::string_view known = type != nullptr ? type : "";
  const bool says_nothing =
      known == "application/octet-stream" || known.substr(0, 5) == "text/" || known.find('/') == std::string_view::npos;
  return says_nothing ? std::string() : std::string(known);
}

}  // namespace

void ReadPlainFile(const Source& source, Findings& findings) { ReadText(source, &DeclaresNothing, nullptr, findings); }

void ReadHtmlFile(const Source& source, Findings& findings) {
  ReadText(source, &DeclaredHtmlEncoding, &ReadHtml, findings);
}

void ReadXmlFile(const Source& source, Findings& findings) {
  ReadText(source, &DeclaredXmlEncoding, &ReadXml, findings);
}

void ReadUnknownFile(const Source& source, Findings& findings) {
  Head head;
  if (!ReadHead(source, kReadMaxBytes, head)) return findings.Fail("cannot be read");
  if (head.bytes.empty()) return;
  if (AddDecoded(head, &DeclaresNothing, nullptr, findings))
    return findings.Set(field::kKOVAMDContentType, "text/plain");
  const std::string type = TypeByMagic(head.bytes);
  findings.Set(field::kKOVAMDContentType, type.empty() ? "application/octet-stream" : type);
  if (type.empty()) findings.Fail("not text");
}

void PrepareTextReaders() {
  LoadConverters();
  g_magic = magic_open(MAGIC_MIME_TYPE | MAGIC_NO_CHECK_COMPRESS | MAGIC_NO_CHECK_TEXT | MAGIC_NO_CHECK_ENCODING);
  if (g_magic != nullptr && magic_load(g_magic, nullptr) != 0) {
    magic_close(g_magic);
    g_magic = nullptr;
  }
}

}  // namespace ferrox::extract
