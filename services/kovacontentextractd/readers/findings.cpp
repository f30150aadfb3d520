#include <algorithm>
#include <cmath>
#include <cstring>
#include <string>
#include <utility>

#include "services/kovacontentextractd/readers/reader.h"
#include "services/kovacontentextractd/readers/utf8.h"

namespace ferrox::extract {

namespace {

/// Of one field: titles and comments are shorter, and a file must not fill the answer with something else than text.
constexpr size_t kFieldMaxBytes = 32U << 10;
/// Values of lists, of all fields together: each is compared with those before it.
constexpr int kAppendMax = 50000;
/// Of an attachment's name, the end: what matters of it is the extension.
constexpr size_t kFieldNameMaxBytes = 255;
constexpr std::string_view kLongField = "not all of a long field";
constexpr std::string_view kBetweenValues = ", ";
constexpr std::string_view kReplacement = "\xEF\xBF\xBD";
/// What is cut off at both ends of a field: blanks, and the zeros that fixed fields are filled up with.
constexpr std::string_view kBlanks("\0 \t\r\n\v\f", 7);

/// Appends with a replacement for each byte that is part of no character, and a blank for each zero.
void AppendClean(std::string& out, std::string_view text) {
  const size_t begin = out.size();
  while (!text.empty()) {
    const size_t valid = ValidUtf8Prefix(text);
    out.append(text.substr(0, valid));
    text.remove_prefix(valid);
    if (text.empty()) break;
    out.append(kReplacement);
    text.remove_prefix(1);
  }
  for (size_t zero = begin; (zero = out.find('\0', zero)) != std::string::npos;) out[zero] = ' ';
}

/// A field's value: clean, without blanks at either end, and not too long, for which it may be `cut`.
std::string FieldValue(std::string_view text, bool& cut) {
  const size_t first = text.find_first_not_of(kBlanks);
  if (first == std::string_view::npos) return {};
  text = text.substr(first, text.find_last_not_of(kBlanks) + 1 - first);
  cut = text.size() > kFieldMaxBytes;
  std::string value;
  AppendClean(value, CutAtCharacter(text, kFieldMaxBytes));
  value.resize(CutAtCharacter(value, kFieldMaxBytes).size());
  return value;
}

/// A text without a copy, zeros in it included; empty for what is no text.
std::string_view View(const Json::Value& value) {
  const char *begin = nullptr, *end = nullptr;
  if (!value.isString() || !value.getString(&begin, &end)) return {};
  return {begin, static_cast<size_t>(end - begin)};
}

/// Whether `value` is one of the values that `joined` holds. What separates them is looked for with it: a value that
/// is one character, in one that is only that character, would be found too often otherwise.
bool Holds(std::string_view joined, std::string_view value) {
  const std::string separator(kBetweenValues);
  const std::string begin = std::string(value) + separator, end = separator + std::string(value);
  return joined == value || joined.starts_with(begin) || joined.ends_with(end) ||
         joined.find(end + separator) != std::string_view::npos;
}

}  // namespace

/// Cut at the border of a character. A text that is bad UTF-8 grows by its replacements, so it is cut once more.
bool Findings::AddText(std::string_view text) {
  if (cut_) return false;
  const size_t room = limits_.text_bytes - std::min(limits_.text_bytes, text_.size());
  const std::string_view fitting = CutAtCharacter(text, room);
  cut_ = fitting.size() < text.size();
  AppendClean(text_, fitting);
  if (text_.size() > limits_.text_bytes) {  // replacements are longer than what they replace
    text_.resize(CutAtCharacter(text_, limits_.text_bytes).size());
    cut_ = true;
  }
  return !cut_;
}

void Findings::Break() {
  if (!text_.empty() && text_.back() != '\n' && text_.size() < limits_.text_bytes) text_ += '\n';
}

void Findings::Set(const char* field, std::string_view value) {
  bool cut = false;
  std::string clean = FieldValue(value, cut);
  if (cut) Omit(kLongField);
  if (!clean.empty()) fields_[field] = std::move(clean);
}

void Findings::Append(const char* field, std::string_view value) {
  const Json::Value* present = fields_.find(field, field + strlen(field));
  const std::string_view joined = present != nullptr ? View(*present) : std::string_view();
  const bool full = joined.size() + kBetweenValues.size() >= kFieldMaxBytes || appended_ == kAppendMax;
  bool cut = full && !value.empty();
  const std::string added = full ? std::string() : FieldValue(value, cut);
  if (cut) Omit(kLongField);
  if (added.empty()) return;
  ++appended_;
  if (joined.empty()) return Set(field, added);
  if (Holds(joined, added)) return;
  const bool fits = joined.size() + kBetweenValues.size() + added.size() <= kFieldMaxBytes;
  if (!fits) return Omit(kLongField);
  fields_[field] = std::string(joined) + std::string(kBetweenValues) + added;
}

void Findings::SetInteger(const char* field, int64_t value) { fields_[field] = Json::Int64(value); }

void Findings::SetNumber(const char* field, double value) {
  if (std::isfinite(value)) fields_[field] = value;
}

size_t Findings::AttachmentRoom() const {
  return attachments_.size() < limits_.attachments ? limits_.attached_bytes - attached_bytes_ : 0;
}

void Findings::Attach(Attachment attachment) {
  if (attachment.bytes.empty()) return;
  if (attachment.bytes.size() > AttachmentRoom()) return Omit("not all of its attachments");
  attached_bytes_ += attachment.bytes.size();
  const size_t begin = attachment.name.size() - std::min(attachment.name.size(), kFieldNameMaxBytes);
  bool cut = false;
  attachment.name = FieldValue(std::string_view(attachment.name).substr(begin), cut);
  attachments_.push_back(std::move(attachment));
}

void Findings::Fail(std::string_view reason) {
  bool cut = false;
  if (failure_.empty()) failure_ = FieldValue(reason, cut);
}

void Findings::Omit(std::string_view what) {
  if (omitted_.empty()) omitted_ = what;
}

Json::Value Findings::ToFields() const {
  Json::Value fields = fields_;
  if (cut_) fields[field::k_KOVATextCut] = true;
  if (!omitted_.empty()) fields[field::k_KOVAExtractError] = std::string(kPartlyRead) + omitted_;
  if (!failure_.empty()) fields[field::k_KOVAExtractError] = failure_;
  return fields;
}

Json::Value Findings::ToDocument() const {
  Json::Value document = ToFields();
  if (!text_.empty()) document[field::kKOVAMDTextContent] = text_;
  return document;
}

}  // namespace ferrox::extract
