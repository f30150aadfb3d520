#include "services/kovaelasticd/store/document.h"

#include <algorithm>
#include <cinttypes>
#include <cstdio>
#include <cstdlib>
#include <cstring>

#include "base/text.h"
#include "common/file_util.h"
#include "fileindex/util.h"
#include "services/kovaelasticd/store/packed_fields.h"
#include "services/kovaelasticd/text/stems.h"
#include "services/kovaelasticd/text/words.h"

namespace ferrox::engine {

namespace {

/// Larger numbers are in no range.
constexpr double kRangedMax = 1e15;

/// A field whose value follows from a column: its name and how it follows. Its place in the table is its bit in
/// DocRow::derived, so new ones are added at the end.
struct DerivedField {
  const char* name;
  Json::Value (*value)(const DocRow& row);
};
const DerivedField kDerived[] = {
    {field::kPath, [](const DocRow& row) { return Json::Value(row.path); }},
    {field::kParent, [](const DocRow& row) { return Json::Value(Dirname(row.path)); }},
    {field::kFsName, [](const DocRow& row) { return Json::Value(Basename(row.path)); }},
    {field::kSearchName, [](const DocRow& row) { return Json::Value(Basename(row.path)); }},
    {field::kDisplayName, [](const DocRow& row) { return Json::Value(Basename(row.path)); }},
    {field::kKind, [](const DocRow& row) { return Json::Value(row.ext); }},
    {field::kExtension, [](const DocRow& row) { return Json::Value(row.ext); }},
    {field::kSize, [](const DocRow& row) { return Json::Value(Json::Int64(row.size.value_or(-1))); }},
    {field::kContentChangeDate, [](const DocRow& row) { return Json::Value(Json::Int64(row.mtime.value_or(-1))); }},
    {field::kIsDir, [](const DocRow& row) { return Json::Value(row.kind == kFolder); }},
    {field::kExtractError, [](const DocRow& row) { return Json::Value(row.error); }},
};

/// The place of a field in kDerived; -1 when it is not in there.
int DerivedIndex(const std::string& name) {
  for (size_t i = 0; i < std::size(kDerived); ++i) {
    if (name == kDerived[i].name) return static_cast<int>(i);
  }
  return -1;
}

/// A member that is a text, or else `otherwise`.
std::string TextMember(const Json::Value& document, const char* name, const std::string& otherwise) {
  const Json::Value& member = document[name];
  return member.isString() ? member.asString() : otherwise;
}

std::optional<int64_t> IntMember(const Json::Value& document, const char* name) {
  const Json::Value& member = document[name];
  return member.isInt64() ? std::optional<int64_t>(member.asInt64()) : std::nullopt;
}

bool IsWanted(const std::vector<std::string>& wanted, const std::string& name) {
  return wanted.empty() || std::find(wanted.begin(), wanted.end(), name) != wanted.end();
}

/// Appends every text in `value`, itself or in an array, each on a line of its own.
void AppendTexts(std::string& out, const Json::Value& value) {
  if (value.isArray()) {
    for (const Json::Value& element : value) AppendTexts(out, element);
  } else if (value.isString()) {
    out += value.asString();
    out += '\n';
  } else if (value.isInt64()) {
    out += std::to_string(value.asInt64());
    out += '\n';
  }
}

/// Appends the words of a field, each with the field's name before it: "KOVAMDTitle<1F>holiday". One column of the
/// full-text table thus holds the words of all fields.
void AppendFieldWords(std::string& out, const std::string& name, const Json::Value& value) {
  std::string text;
  AppendTexts(text, value);
  WordScanner scanner(text);
  while (scanner.Next()) {
    out += name;
    out += kFieldEnd;
    out += scanner.Word();
    out += kReadyEnd;
  }
}

/// Appends the words of a folder's name, as AppendFieldWords does, and what else they are looked for as.
void AppendFolderNameWords(std::string& out, std::string_view folder_name) {
  std::vector<std::string> words;
  for (WordScanner scanner(folder_name); scanner.Next();) words.emplace_back(scanner.Word());
  for (size_t i = 0, plain = words.size(); i < plain; ++i) {
    for (std::string& stem : QueryStems(words[i])) words.push_back(std::move(stem));
  }
  for (const std::string& word : words) (((out += kFolderNameField) += kFieldEnd) += word) += kReadyEnd;
}

/// A number of 0 or more, rounded; nothing for what is none. Readers give some numbers as texts.
std::optional<int64_t> WholeNumber(const Json::Value& value) {
  double number = -1;
  if (value.isNumeric()) {
    number = value.asDouble();
  } else if (value.isString()) {
    const std::string text = value.asString();
    char* end = nullptr;
    number = strtod(text.c_str(), &end);
    if (end == text.c_str() || *end != '\0') return std::nullopt;
  }
  if (!(number >= 0 && number < kRangedMax)) return std::nullopt;
  return static_cast<int64_t>(number + 0.5);
}

/// Appends the word that ranges find a field's number by.
void AppendRangeWord(std::string& out, const std::string& name, const Json::Value& value) {
  const std::optional<int64_t> number = WholeNumber(value);
  if (number.has_value()) out += RangeWord(name, *number) + kReadyEnd;
}

}  // namespace

std::string ProseMark(Language language) { return {kProseMark, static_cast<char>('A' + static_cast<int>(language))}; }

Language MarkedLanguage(std::string_view prose) {
  return prose.size() < kProseMarkBytes ? Language::kNone : LanguageOfNumber(prose[1] - 'A');
}

std::string RangeWord(const std::string& field_name, int64_t number) {
  const auto limited = std::clamp<int64_t>(number, 0, static_cast<int64_t>(kRangedMax));
  char digits[32];  // 16 digits: the words' order, which is that of bytes, is then that of the numbers
  (void)snprintf(digits, sizeof(digits), "#%016" PRId64, limited);
  return field_name + kFieldEnd + digits;
}

void FieldNames::Add(int64_t number, const std::string& name) {
  if (static_cast<size_t>(number) > names_.size()) names_.resize(static_cast<size_t>(number));
  names_[static_cast<size_t>(number - 1)] = name;
  numbers_[name] = number;
}

int64_t FieldNames::NumberOf(const std::string& name) const {
  const auto found = numbers_.find(name);
  return found == numbers_.end() ? 0 : found->second;
}

const std::string* FieldNames::NameOf(int64_t number) const {
  if (number < 1 || static_cast<size_t>(number) > names_.size()) return nullptr;
  return &names_[static_cast<size_t>(number - 1)];
}

/// A field is left out of the packed ones only where its value is exactly the one that its column gives back: documents
/// are returned as they were stored.
DocRow PackDocument(const std::string& path, const Json::Value& document, const FieldNames& names) {
  DocRow row;
  row.path = path;
  row.name = TextMember(document, field::kSearchName, TextMember(document, field::kFsName, Basename(path)));
  row.ext = base::LowerAscii(TextMember(document, field::kExtension, GetFileExtension(path, true)));
  row.size = IntMember(document, field::kSize);
  row.mtime = IntMember(document, field::kContentChangeDate);
  row.error = TextMember(document, field::kExtractError, "");
  const Json::Value& is_dir = document[field::kIsDir];
  row.kind = is_dir.isBool() && is_dir.asBool() ? static_cast<int32_t>(kFolder)
                                                : static_cast<int32_t>(fileindex::GetFileTypeByFullPath("." + row.ext));
  for (auto member = document.begin(); member != document.end(); ++member) {
    const std::string name = member.name();
    if (name == field::kTextContent || name == field::kAccess) continue;
    const int derived = DerivedIndex(name);
    if (derived >= 0 && kDerived[derived].value(row) == *member) {
      row.derived |= 1U << derived;
    } else {
      AddField(row.packed, names.NumberOf(name), *member);
    }
  }
  return row;
}

uint32_t DerivedBit(const std::string& name) {
  const int index = DerivedIndex(name);
  return index < 0 ? 0 : 1U << index;
}

std::vector<std::string> NamesNeeded(const Json::Value& document, const FieldNames& names) {
  std::vector<std::string> needed;
  for (auto member = document.begin(); member != document.end(); ++member) {
    const std::string name = member.name();
    if (name != field::kAccess && names.NumberOf(name) == 0) needed.push_back(name);
  }
  return needed;
}

Json::Value UnpackDocument(const DocRow& row, const FieldNames& names, const std::vector<std::string>& wanted) {
  Json::Value document(Json::objectValue);
  for (size_t i = 0; i < std::size(kDerived); ++i) {
    if ((row.derived >> i & 1) != 0 && IsWanted(wanted, kDerived[i].name)) {
      document[kDerived[i].name] = kDerived[i].value(row);
    }
  }
  for (PackedFields fields(row.packed); fields.Next();) {
    const std::string* name = names.NameOf(fields.Number());
    if (name != nullptr && IsWanted(wanted, *name)) document[*name] = fields.Value();
  }
  return document;
}

MetaText MakeMetaText(const DocRow& row, const Json::Value& document, const Schema& schema) {
  MetaText meta;
  meta.language = row.language;
  meta.grams = kGramsMark + row.name;
  meta.name = ProseMark(row.language) + row.name;
  meta.title = ProseMark(row.language);
  meta.text = ProseMark(row.language);
  meta.fields = kReadyMark;
  bool has_title = false;
  for (auto member = document.begin(); member != document.end(); ++member) {
    const std::string name = member.name();
    if (name == field::kTitle) {
      AppendTexts(meta.title, *member);
      has_title = *member == row.title;
    } else if (schema.IsPlain(name)) {
      AppendTexts(meta.text, *member);
    }
    if (Schema::IsSearchable(name) && name != field::kTitle) AppendFieldWords(meta.fields, name, *member);
    if (Schema::IsRanged(name)) AppendRangeWord(meta.fields, name, *member);
  }
  if (!has_title) meta.title += row.title;
  if (row.kind == kFolder) AppendFolderNameWords(meta.fields, Basename(row.path));
  return meta;
}

}  // namespace ferrox::engine
