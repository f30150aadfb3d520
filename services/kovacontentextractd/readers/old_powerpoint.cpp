#include <algorithm>
#include <string>
#include <vector>

#include "services/kovacontentextractd/readers/code_pages.h"
#include "services/kovacontentextractd/readers/little_endian.h"
#include "services/kovacontentextractd/readers/old_office_parts.h"
#include "services/kovacontentextractd/readers/utf8.h"

namespace ferrox::extract {

namespace {

// The stream "PowerPoint Document" of PowerPoint 97 to 2003 is a tree of records with a head of 8 bytes: version and
// instance (2 bytes, 15 in the low 4 bits for a record that holds others), type (2), size of the content (4). Text
// stands in two types of record, in UTF-16 or in its low bytes; a file that was saved fast has old versions of slides
// too, whose text is read as well.
enum SlideRecord : uint16_t {
  kMainMaster = 0x03F8,  ///< "Click to edit the title", not the author's words
  kHandout = 0x0FC9,
  kTextUtf16 = 0x0FA0,
  kTextBytes = 0x0FA8,
  kName = 0x0FBA,  ///< a short text; most are the program's own
  kHeadersFooters = 0x0FD9,
  kExtension = 0x138B,  ///< holds what later versions of the program added, comments among it
  kComment = 0x2EE0,
};
constexpr size_t kSlideTextMaxBytes = 1U << 20;  ///< of one record

/// The stream "Current User" has a token at 0C that differs for an encrypted document.
bool IsEncrypted(const CompoundFile& file) {
  constexpr uint32_t kEncryptedToken = 0xF3D1C4DF;
  const auto user = file.Open("Current User");
  return user != nullptr && Little32(user->ReadAt(0, 16), 12) == kEncryptedToken;
}

/// Lines end with a carriage return, and within a paragraph with a vertical tab.
bool AddLines(std::string text, Findings& findings) {
  for (char& c : text) {
    if (c == '\r' || c == '\v') c = '\n';
  }
  const bool more = findings.AddText(text);
  findings.Break();
  return more;
}

std::string FromLowBytes(std::string_view bytes) {
  std::string text;
  for (const char c : bytes) AppendUtf8(text, static_cast<unsigned char>(c));
  return text;
}

/// Records hold records; those that hold others have 15 in the low bits of their first number. Some that have hold
/// something else, so what is read in a record ends with it, whatever its own records claim.
class SlideReader {
 public:
  SlideReader(CompoundStream& stream, Findings& findings) : stream_(stream), findings_(findings) {}

  /// Up to a place in the stream. False when the findings take no more.
  bool Read(uint64_t end) {
    std::string header(kHeaderBytes, '\0');
    while (At() + kHeaderBytes <= end && stream_.Read(header.data(), kHeaderBytes) == kHeaderBytes) {
      const uint64_t record_end = At() + std::min<uint64_t>(Little32(header, 4), end - At());
      if (!Take(Little16(header, 2), (Little16(header, 0) & 0x0F) == 0x0F, record_end)) return false;
      stream_.Skip(record_end - std::min(record_end, At()));
    }
    return true;
  }

 private:
  static constexpr size_t kHeaderBytes = 8;
  static constexpr int kDepthMax = 32;

  uint64_t At() const { return stream_.Size() - stream_.Left(); }

  bool Take(uint16_t type, bool holds_others, uint64_t end) {
    if (type == kComment || type == kHeadersFooters) names_end_ = end;
    if (type == kTextUtf16 || type == kTextBytes || (type == kName && At() < names_end_)) {
      return AddText(type, end - At());
    }
    const bool wanted = type == kExtension || (holds_others && type != kMainMaster && type != kHandout);
    if (!wanted || depth_ == kDepthMax) return true;
    ++depth_;
    const bool more = Read(end);
    --depth_;
    return more;
  }

  bool AddText(uint16_t type, uint64_t size) {
    std::string bytes(static_cast<size_t>(std::min<uint64_t>({size, stream_.Left(), kSlideTextMaxBytes})), '\0');
    bytes.resize(stream_.Read(bytes.data(), bytes.size()));
    return AddLines(type == kTextBytes ? FromLowBytes(bytes) : FromUtf16Little(bytes), findings_);
  }

  CompoundStream& stream_;
  Findings& findings_;
  uint64_t names_end_ = 0;  ///< of the record in which short texts are some that people wrote
  int depth_ = 0;
};

}  // namespace

void ReadOldPowerPoint(const CompoundFile& file, Findings& findings) {
  if (IsEncrypted(file)) return findings.Fail("encrypted");
  // Saved for two versions of the program: what the newer one reads has a storage of its own.
  const std::vector<uint32_t> newer = file.Storages("PP97_DUALSTORAGE");
  auto stream = newer.empty() ? nullptr : file.Open("PowerPoint Document", newer.front());
  if (stream == nullptr) stream = file.Open("PowerPoint Document");
  (void)SlideReader(*stream, findings).Read(stream->Size());
}

}  // namespace ferrox::extract
