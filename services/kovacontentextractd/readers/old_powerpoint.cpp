#include <algorithm>
#include <string>

#include "services/kovacontentextractd/readers/code_pages.h"
#include "services/kovacontentextractd/readers/little_endian.h"
#include "services/kovacontentextractd/readers/old_office_parts.h"
#include "services/kovacontentextractd/readers/utf8.h"

namespace ferrox::extract {

namespace {

enum RecordType : uint16_t { kMainMaster = 0x03F8, kHandout = 0x0FC9, kTextUtf16 = 0x0FA0, kTextBytes = 0x0FA8 };
constexpr size_t kTextMaxBytes = 1U << 20;

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

}  // namespace

/// Records hold records; those that hold others have 15 in the low bits of their first number, and are walked into.
void ReadOldPowerPoint(const CompoundFile& file, Findings& findings) {
  constexpr size_t kHeaderBytes = 8;
  if (IsEncrypted(file)) return findings.Fail("encrypted");
  const auto stream = file.Open("PowerPoint Document");
  std::string header(kHeaderBytes, '\0');
  while (stream->Read(header.data(), kHeaderBytes) == kHeaderBytes) {
    const uint16_t type = Little16(header, 2);
    const uint32_t size = Little32(header, 4);
    const bool holds_others = (Little16(header, 0) & 0x0F) == 0x0F;
    if (holds_others && type != kMainMaster && type != kHandout) continue;
    if (type != kTextUtf16 && type != kTextBytes) {
      stream->Skip(size);
      continue;
    }
    std::string bytes(std::min<uint64_t>({size, stream->Left(), kTextMaxBytes}), '\0');
    bytes.resize(stream->Read(bytes.data(), bytes.size()));
    stream->Skip(size - bytes.size());
    if (!AddLines(type == kTextUtf16 ? FromUtf16Little(bytes) : FromLowBytes(bytes), findings)) return;
  }
}

}  // namespace ferrox::extract
