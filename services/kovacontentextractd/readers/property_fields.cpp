#include "services/kovacontentextractd/readers/property_fields.h"

#include <algorithm>
#include <charconv>
#include <string>

#include "services/kovacontentextractd/readers/times.h"
#include "services/kovacontentextractd/readers/xml_tokenizer.h"

namespace ferrox::extract {

namespace {

using Token = XmlTokenizer::Token;

constexpr size_t kPropertyMaxBytes = 32U << 10;
constexpr int kPropertiesMax = 20000;

void SetTime(const char* field, std::string_view value, Findings& findings) {
  if (const auto seconds = ParseTime(value)) findings.SetInteger(field, *seconds);
}

void SetCount(const char* field, std::string_view value, Findings& findings) {
  int64_t count = 0;
  (void)std::from_chars(value.data(), value.data() + value.size(), count);
  if (count > 0) findings.SetInteger(field, count);
}

}  // namespace

void SetProperty(const PropertyField& property, std::string_view value, Findings& findings) {
  if (property.kind == PropertyField::kTime) return SetTime(property.field, value, findings);
  if (property.kind == PropertyField::kCount) return SetCount(property.field, value, findings);
  if (property.kind != PropertyField::kSemicolonList) return findings.Append(property.field, value);
  while (!value.empty()) {
    const size_t end = std::min(value.find(';'), value.size());
    findings.Append(property.field, value.substr(0, end));
    value.remove_prefix(std::min(end + 1, value.size()));
  }
}

void AddPropertyFields(ByteSource& source, std::span<const PropertyField> fields, Findings& findings) {
  XmlTokenizer xml(source);
  std::string value;
  int found = 0;
  for (Token token; found < kPropertiesMax && xml.Next(token);) {
    if (token == Token::kOpen) value.clear();
    if (token == Token::kText && value.size() < kPropertyMaxBytes) value += xml.Text();
    if (token != Token::kClose) continue;
    for (const PropertyField& property : fields) {
      if (property.element != xml.Name()) continue;
      SetProperty(property, value, findings);
      ++found;
    }
    value.clear();
  }
}

}  // namespace ferrox::extract
