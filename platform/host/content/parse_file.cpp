#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <cstring>
#include <stdexcept>
#include <string>

#include <json/value.h>

#include <kova/content_extract.h>

#include "platform/host/content/content_type.h"
#include "platform/host/content/encoding.h"
#include "platform/host/content/facts.h"
#include "platform/host/content/markup.h"
#include "platform/host/content/utf8.h"
#include "platform/host/files.h"

namespace kova::content {

namespace {

constexpr size_t kTextMaxBytes = 1 << 20;
/// How much of a file is read. Markup and UTF-16 hold less text than they have bytes.
constexpr size_t kReadMaxBytes = 2 << 20;

/// Opens for reading without waiting for a writer of a FIFO, without following a link that took the file's place, and,
/// where that is allowed, without touching the time of last access.
int OpenForReading(const std::string& path) {
  constexpr int kFlags = O_RDONLY | O_NOFOLLOW | O_NONBLOCK | O_CLOEXEC | O_NOCTTY;
  const int fd = open(path.c_str(), kFlags | O_NOATIME);
  return fd < 0 && errno == EPERM ? open(path.c_str(), kFlags) : fd;
}

struct Head {
  std::string bytes;
  bool cut = false;
};

/// Whether another file has taken the place of the one that was examined. There are file systems on which the numbers
/// of an open file are always others than those of its path.
bool IsReplaced(const std::string& path, const struct stat& opened, const struct statx& examined) {
  struct stat now = {};
  return opened.st_ino != examined.stx_ino && (lstat(path.c_str(), &now) != 0 || now.st_ino != examined.stx_ino);
}

/// Reads the beginning of the file that was examined. Returns the reason when it cannot be read, or an empty text.
/// @throws std::runtime_error when it is no longer at the path: a document that calls it unreadable, or that has the
/// content of another, would be taken for true where it has gone.
std::string ReadHead(const std::string& path, const struct statx& examined, Head& head) {
  const host::Fd file(OpenForReading(path));
  if (!file.Valid() && (errno == ENOENT || errno == ENOTDIR)) throw std::runtime_error(path + " is gone");
  struct stat info = {};
  if (!file.Valid() || fstat(file.Get(), &info) != 0) return strerror(errno);
  if (IsReplaced(path, info, examined)) throw std::runtime_error(path + " is another file now");
  if (!S_ISREG(info.st_mode)) return "not a regular file";
  size_t wanted = static_cast<size_t>(std::min<uint64_t>(examined.stx_size, kReadMaxBytes)) + 1;
  size_t have = 0;
  for (;;) {
    head.bytes.resize(wanted);
    const ssize_t got = read(file.Get(), head.bytes.data() + have, wanted - have);
    if (got < 0 && errno == EINTR) continue;
    if (got < 0) return strerror(errno);
    have += static_cast<size_t>(got);
    if (got == 0 || have > kReadMaxBytes) break;
    if (have == wanted) wanted = std::min(wanted * 2, kReadMaxBytes + 1);  // it has grown since it was examined
  }
  head.cut = have > kReadMaxBytes;
  head.bytes.resize(std::min(have, kReadMaxBytes));
  return {};
}

std::string Declared(Reader reader, std::string_view bytes) {
  if (reader == Reader::kHtml) return DeclaredHtmlEncoding(bytes);
  return reader == Reader::kXml ? DeclaredXmlEncoding(bytes) : std::string();
}

MarkupText Read(Reader reader, DecodedText& decoded) {
  if (reader == Reader::kHtml) return ReadHtml(decoded.text, kTextMaxBytes);
  if (reader == Reader::kXml) return ReadXml(decoded.text, kTextMaxBytes);
  MarkupText plain;
  plain.cut = decoded.text.size() > kTextMaxBytes;
  if (plain.cut) decoded.text.resize(CutAtCharacter(decoded.text, kTextMaxBytes).size());
  plain.text = std::move(decoded.text);
  return plain;
}

/// Adds what the bytes tell. Returns the reason when they tell nothing, or an empty text.
std::string AddText(const Head& head, Reader reader, Json::Value& document) {
  DecodedText decoded;
  if (!Decode(head.bytes, head.cut, Declared(reader, head.bytes), decoded)) return "not text";
  document["_KOVATextEncoding"] = decoded.encoding;
  MarkupText read = Read(reader, decoded);
  if (!read.title.empty()) document["KOVAMDTitle"] = read.title;
  if (!read.text.empty()) document["KOVAMDTextContent"] = std::move(read.text);
  if (head.cut || read.cut) document["_KOVATextCut"] = true;
  return {};
}

/// Opens the file and adds its type, where the name did not tell it, and its text. `by_name` is null when it did not.
/// Returns the reason when there is no text to get, or an empty text.
std::string AddContent(const std::string& path, const Facts& facts, const ContentType* by_name, Json::Value& document) {
  Head head;
  const std::string problem = ReadHead(path, facts.info, head);
  if (!problem.empty() || head.bytes.empty()) return problem;
  const ContentType* type = by_name != nullptr ? by_name : TypeByMark(head.bytes);
  const Reader reader = type != nullptr ? type->reader : Reader::kPlain;
  if (type != nullptr) document["KOVAMDContentType"] = type->mime;
  // A known format that no reader exists for yet is no failure.
  if (reader == Reader::kNone) return {};
  std::string reason = AddText(head, reader, document);
  if (type == nullptr) document["KOVAMDContentType"] = reason.empty() ? "text/plain" : "application/octet-stream";
  return reason;
}

}  // namespace

}  // namespace kova::content

namespace KOVA::CONTENT_EXTRACT {

void ParseFile(const std::string& path, const Json::Value& config, Json::Value& document) {
  using namespace kova::content;
  const Facts facts = AddFacts(path, document);
  const bool need_meta =
      config.isObject() && config.isMember("need_meta") && config["need_meta"].isBool() && config["need_meta"].asBool();
  const char* special = TypeByMode(facts.info.stx_mode);
  const ContentType* type = TypeByExtension(facts.extension);
  if (special != nullptr) {
    document["KOVAMDContentType"] = special;
  } else if (type != nullptr) {
    document["KOVAMDContentType"] = type->mime;
  }
  if (!need_meta || S_ISDIR(facts.info.stx_mode)) return;
  document["_KOVANeedMeta"] = true;
  const bool has_reader = special == nullptr && (type == nullptr || type->reader != Reader::kNone);
  const std::string reason = special != nullptr ? "not a regular file"
                             : has_reader       ? AddContent(path, facts, type, document)
                                                : std::string();
  if (!reason.empty()) document["_KOVAExtractError"] = reason;
}

}  // namespace KOVA::CONTENT_EXTRACT
