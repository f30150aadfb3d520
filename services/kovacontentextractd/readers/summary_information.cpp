#include <algorithm>

#include "services/kovacontentextractd/readers/code_pages.h"
#include "services/kovacontentextractd/readers/little_endian.h"
#include "services/kovacontentextractd/readers/old_office_parts.h"
#include "services/kovacontentextractd/readers/times.h"

namespace ferrox::extract {

namespace {

// A property set ([MS-OLEPS]) begins with a head of 48 bytes, which has the place of its first section at 2C. A section
// has its size, the number of properties and for each of them an id and its place in the section (4 bytes each, from
// 8). A value is its type (4 bytes), for texts the size in bytes or characters (4 bytes), and the value itself. The ids
// below are those of the two sets that each office document has.
constexpr size_t kSetMaxBytes = 1U << 20;
constexpr size_t kTextMaxBytes = 64U << 10;
constexpr uint32_t kNumberedMax = 1000;
constexpr int kValuesMax = 100;  ///< of those that are wanted: a set has each once
constexpr uint32_t kCodePageId = 1;
enum ValueType : uint32_t { kInt16 = 2, kInt32 = 3, kBytes = 30, kUtf16 = 31, kFileTime = 64 };

struct Property {
  uint32_t id;
  const char* field;
};

constexpr Property kSummary[] = {
    {2, field::kKOVAMDTitle},
    {3, field::kKOVAMDDescription},
    {4, field::kKOVAMDAuthors},
    {5, field::kKOVAMDKeywords},
    {6, field::kKOVAMDComment},
    {8, field::kKOVAMDContributors},
    {12, field::kKOVAMDContentCreationDate},
    {13, field::kKOVAMDContentModificationDate},
    {14, field::kKOVAMDNumberOfPages},
    {18, field::kKOVAMDCreator},
    {18, field::kKOVAMDEncodingApplications},
};
constexpr Property kDocumentSummary[] = {
    {2, field::kKOVAMDKeywords},
    {7, field::kKOVAMDNumberOfPages},
    {15, field::kKOVAMDOrganizations},
};

/// Sets one field from the value at `at`: its type, then what the type has.
void SetValue(std::string_view set, size_t at, int code_page, const char* field, Findings& findings) {
  const uint32_t type = Little32(set, at) & 0xFFFF;
  const std::string_view value = set.substr(std::min(at + 4, set.size()));
  const std::string_view text = value.substr(std::min<size_t>(4, value.size()), kTextMaxBytes);
  if (type == kBytes) {
    const std::string_view bytes = text.substr(0, Little32(value, 0));
    findings.Append(field, FromCodePage(bytes.substr(0, bytes.find('\0')), code_page));
  } else if (type == kUtf16) {
    findings.Append(field, FromUtf16Little(text.substr(0, size_t{Little32(value, 0)} * 2)));
  } else if (type == kInt16 || type == kInt32) {
    const auto number = static_cast<int32_t>(type == kInt16 ? Little16(value, 0) : Little32(value, 0));
    if (number > 0) findings.SetInteger(field, number);
  } else if (type == kFileTime) {
    if (const auto seconds = FromFileTime(LittleEndian(value, 0, 8))) findings.SetInteger(field, *seconds);
  }
}

/// Calls `take` with the id of each property and the place of its value.
template <typename Take>
void ForEachProperty(std::string_view set, Take take) {
  const uint32_t count = std::min(Little32(set, 4), kNumberedMax);
  for (uint32_t i = 0; i < count; ++i) take(Little32(set, 8 + i * 8), Little32(set, 12 + i * 8));
}

/// Property 1 is the code page of the set's texts.
int CodePageOf(std::string_view set) {
  int code_page = 1252;
  ForEachProperty(set, [&](uint32_t id, uint32_t at) {
    if (id == kCodePageId) code_page = Little16(set, size_t{at} + 4);
  });
  return code_page;
}

/// Sets the fields for the properties of the set in the stream `name`; nothing where there is none.
template <size_t Count>
void AddSet(const CompoundFile& file, std::string_view name, const Property (&properties)[Count], Findings& findings) {
  const auto stream = file.Open(name);
  const std::string bytes = stream != nullptr ? stream->ReadAt(0, kSetMaxBytes) : std::string();
  const uint32_t begin = Little32(bytes, 44);
  if (bytes.size() < 48 || begin >= bytes.size()) return;
  const std::string_view set = std::string_view(bytes).substr(begin);
  const int code_page = CodePageOf(set);
  int values = 0;
  ForEachProperty(set, [&](uint32_t id, uint32_t at) {
    for (const Property& property : properties) {
      if (property.id == id && ++values <= kValuesMax) SetValue(set, at, code_page, property.field, findings);
    }
  });
}

}  // namespace

int SummaryCodePage(const CompoundFile& file) {
  constexpr size_t kHeadBytes = 4096;
  const auto stream = file.Open("\005SummaryInformation");
  const std::string bytes = stream != nullptr ? stream->ReadAt(0, kHeadBytes) : std::string();
  const std::string_view set = std::string_view(bytes).substr(std::min<size_t>(Little32(bytes, 44), bytes.size()));
  return CodePageOf(set);
}

void AddSummaryInformation(const CompoundFile& file, Findings& findings) {
  AddSet(file, "\005SummaryInformation", kSummary, findings);
  AddSet(file, "\005DocumentSummaryInformation", kDocumentSummary, findings);
}

}  // namespace ferrox::extract
