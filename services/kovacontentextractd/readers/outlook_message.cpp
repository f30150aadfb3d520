#include <string>

#include "services/kovacontentextractd/readers/code_pages.h"
#include "services/kovacontentextractd/readers/encoding.h"
#include "services/kovacontentextractd/readers/little_endian.h"
#include "services/kovacontentextractd/readers/markup.h"
#include "services/kovacontentextractd/readers/old_office_parts.h"
#include "services/kovacontentextractd/readers/times.h"

namespace ferrox::extract {

namespace {

// A message file ([MS-OXMSG]) has one stream for each property of variable size, "__substg1.0_" with the property's
// number and type in hexadecimal: 001F is UTF-16, 001E bytes in some code page, 0102 other bytes. Recipients and
// attachments have storages with such streams of their own. Properties of fixed size stand in a table, the stream
// "__properties_version1.0". The numbers used here are 0037 subject, 0C1A sender's name, 5D01 sender's address, 0E04
// and 0E03 those that it was sent and copied to, 1000 the text, 1013 the same as HTML.
constexpr size_t kPropertyStreamMaxBytes = 2U << 20;

/// A property's text by its number: in UTF-16, or in bytes of an encoding that the file does not name.
std::string TextOf(const CompoundFile& file, const std::string& number, uint32_t storage = CompoundFile::kRoot) {
  if (const auto wide = file.Open("__substg1.0_" + number + "001F", storage)) {
    return FromUtf16Little(wide->ReadAt(0, kPropertyStreamMaxBytes));
  }
  const auto narrow = file.Open("__substg1.0_" + number + "001E", storage);
  DecodedText decoded;
  if (narrow != nullptr) (void)Decode(narrow->ReadAt(0, kPropertyStreamMaxBytes), true, {}, decoded);
  return decoded.text;
}

/// When the message was sent. The table has a head of 32 bytes and entries of 16: type and number (4 bytes), flags (4),
/// the value (8).
void AddSendTime(const CompoundFile& file, Findings& findings) {
  constexpr size_t kHeaderBytes = 32, kEntryBytes = 16, kTableMaxBytes = 1U << 20;
  constexpr uint32_t kSent = 0x00390040;
  const auto stream = file.Open("__properties_version1.0");
  const std::string table = stream != nullptr ? stream->ReadAt(0, kTableMaxBytes) : std::string();
  for (size_t at = kHeaderBytes; at + kEntryBytes <= table.size(); at += kEntryBytes) {
    if (Little32(table, at) != kSent) continue;
    if (const auto seconds = FromFileTime(LittleEndian(table, at + 8, 8))) {
      findings.SetInteger(field::kKOVAMDContentCreationDate, *seconds);
    }
  }
}

/// Property 39FE is the address as mail has it; 3003 may be a name within the sender's organisation instead.
void AddRecipientAddresses(const CompoundFile& file, Findings& findings) {
  for (const uint32_t recipient : file.Storages("__recip_version1.0")) {
    std::string address = TextOf(file, "39FE", recipient);
    if (address.empty()) address = TextOf(file, "3003", recipient);
    if (address.find('@') != std::string::npos) findings.Append(field::kKOVAMDRecipientAddresses, address);
  }
}

/// Each has a storage of its own: long and short name (3707, 3704), content (3701). The content goes to the reader of
/// its own kind.
void AddAttachments(const CompoundFile& file, Findings& findings) {
  for (const uint32_t attachment : file.Storages("__attach_version1.0")) {
    std::string name = TextOf(file, "3707", attachment);
    if (name.empty()) name = TextOf(file, "3704", attachment);
    findings.Break();
    if (!findings.AddText(name)) return;
    const auto content = file.Open("__substg1.0_37010102", attachment);
    if (content == nullptr) continue;
    if (content->Size() > findings.AttachmentRoom()) {
      findings.Omit("not all of its attachments");
      continue;
    }
    findings.Attach({name, content->ReadAt(0, static_cast<size_t>(content->Size()))});
  }
}

}  // namespace

void ReadOutlookMessage(const CompoundFile& file, Findings& findings) {
  findings.Set(field::kKOVAMDTitle, TextOf(file, "0037"));
  findings.Append(field::kKOVAMDAuthors, TextOf(file, "0C1A"));
  findings.Append(field::kKOVAMDAuthorAddresses, TextOf(file, "5D01"));
  findings.Append(field::kKOVAMDRecipients, TextOf(file, "0E04"));
  findings.Append(field::kKOVAMDRecipients, TextOf(file, "0E03"));
  std::string body = TextOf(file, "1000");
  const auto html = body.empty() ? file.Open("__substg1.0_10130102") : nullptr;
  DecodedText decoded;
  if (html != nullptr && Decode(html->ReadAt(0, kPropertyStreamMaxBytes), true, {}, decoded)) {
    body = ReadHtml(decoded.text, findings.Bounds().text_bytes).text;
  }
  (void)findings.AddText(body);
  AddSendTime(file, findings);
  AddRecipientAddresses(file, findings);
  AddAttachments(file, findings);
}

}  // namespace ferrox::extract
