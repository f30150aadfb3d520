#include <string>

#include "services/kovacontentextractd/readers/code_pages.h"
#include "services/kovacontentextractd/readers/encoding.h"
#include "services/kovacontentextractd/readers/markup.h"
#include "services/kovacontentextractd/readers/old_office_parts.h"

namespace ferrox::extract {

namespace {

constexpr size_t kValueMaxBytes = 2U << 20;

/// A property's text by its number: in UTF-16, or in bytes of an encoding that is not told.
std::string TextOf(const CompoundFile& file, const std::string& number) {
  if (const auto wide = file.Open("__substg1.0_" + number + "001F")) {
    return FromUtf16Little(wide->ReadAt(0, kValueMaxBytes));
  }
  const auto narrow = file.Open("__substg1.0_" + number + "001E");
  DecodedText decoded;
  if (narrow != nullptr) (void)Decode(narrow->ReadAt(0, kValueMaxBytes), true, {}, decoded);
  return decoded.text;
}

}  // namespace

void ReadOutlookMessage(const CompoundFile& file, Findings& findings) {
  findings.Set("KOVAMDTitle", TextOf(file, "0037"));
  findings.Append("KOVAMDAuthors", TextOf(file, "0C1A"));
  findings.Append("KOVAMDAuthorAddresses", TextOf(file, "5D01"));
  findings.Append("KOVAMDRecipients", TextOf(file, "0E04"));
  findings.Append("KOVAMDRecipients", TextOf(file, "0E03"));
  std::string body = TextOf(file, "1000");
  const auto html = body.empty() ? file.Open("__substg1.0_10130102") : nullptr;
  DecodedText decoded;
  if (html != nullptr && Decode(html->ReadAt(0, kValueMaxBytes), true, {}, decoded)) {
    body = ReadHtml(decoded.text, findings.Bounds().text_bytes).text;
  }
  (void)findings.AddText(body);
}

}  // namespace ferrox::extract
