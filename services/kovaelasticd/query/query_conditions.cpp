#include "services/kovaelasticd/query/query_conditions.h"

#include <algorithm>
#include <optional>
#include <sstream>
#include <utility>

#include "base/text.h"
#include "common/error.h"
#include "services/kovaelasticd/query/field_names.h"
#include "services/kovaelasticd/query/kinds.h"
#include "services/kovaelasticd/query/query_values.h"
#include "services/kovaelasticd/text/schema.h"
#include "services/kovaelasticd/text/words.h"
#include "wire/fields.h"

namespace ferrox::engine {

namespace {

QueryNode RangeNode(QueryNode::Type type, const ValueRange& range) {
  QueryNode node(type);
  node.low = range.low;
  node.high = range.high;
  return node;
}

/// `either`, or its only child.
QueryNode OnlyOr(QueryNode either) {
  if (either.children.size() > 1) return either;
  QueryNode only = std::move(either.children.front());
  return only;
}

bool IsAsciiAlnum(char c) {
  const char lower = base::LowerAscii(c);
  return (lower >= 'a' && lower <= 'z') || (c >= '0' && c <= '9');
}

/// Of a single word with "*" or "?" within it what stands before the first of them; "" for anything else.
std::string_view BeforeWildcard(std::string_view word) {
  word = word.substr(0, word.find_last_not_of("*?") + 1);  // those of "what??" are punctuation
  const size_t at = word.find_first_of("*?");
  if (at == std::string_view::npos || (word.front() >= '0' && word.front() <= '9')) return {};
  const bool plain = std::all_of(word.begin(), word.end(),
                                 [](char c) { return IsAsciiAlnum(c) || c == '*' || c == '?' || (c & 0x80) != 0; });
  return plain ? word.substr(0, at) : std::string_view();
}

/// The extension in "*.pdf"; "" for anything else.
std::string_view ExtensionAsked(const ConditionValue& value) {
  const std::string_view text = value.text;
  const bool is_one = !value.phrase && !value.prefix && text.size() > 2 && text.starts_with("*.") &&
                      std::all_of(text.begin() + 2, text.end(), &IsAsciiAlnum);
  return is_one ? text.substr(2) : std::string_view();
}

}  // namespace

void ConditionReader::Refuse(size_t at, const std::string& sentence) const {
  size_t character = 1;
  for (size_t pos = 0; pos < std::min(at, query_.size()); pos += DecodeAt(query_, pos).length_bytes) ++character;
  throw Error(Error::kEngineBadRequest, "query, character " + std::to_string(character) + ": " + sentence);
}

void ConditionReader::Hint(const std::string& sentence) const {
  if (hints_ == nullptr || hints_->size() == kQueryHintsMax ||
      std::find(hints_->begin(), hints_->end(), sentence) != hints_->end())
    return;
  hints_->push_back(sentence);
}

/// The index knows words by their beginnings, and names by any part of them: of "rep*t" the beginning is looked for.
ConditionValue ConditionReader::WithoutWildcards(QueryNode::Type type, ConditionValue value) const {
  const size_t begin = value.text.find_first_not_of('*');
  if (begin == std::string::npos) {
    value.text.clear();
  } else if (begin > 0) {
    value.text.erase(0, begin);
    const bool needless = type == QueryNode::Type::kName || !IsAsciiAlnum(value.text.front());
    if (!needless) {
      Hint("a \"*\" can stand only at the end of a word; names are found by any part of them: name:" + value.text);
    }
  }
  const std::string before(BeforeWildcard(value.text));
  if (before.size() < 2) return value;
  Hint("a \"*\" or \"?\" within a word is not known; what is looked for begins with " + before);
  value.text = before;
  value.prefix = true;
  return value;
}

/// A node for words; one that asks for nothing when there is no letter or digit in them.
QueryNode ConditionReader::Words(QueryNode::Type type, const ConditionValue& given) const {
  const std::string extension(ExtensionAsked(given));
  if (type == QueryNode::Type::kText && !extension.empty()) {
    QueryNode node(QueryNode::Type::kExt);
    node.text = base::LowerAscii(extension);
    return node;
  }
  const ConditionValue value = given.phrase ? given : WithoutWildcards(type, given);
  const QueryWords words = SplitQueryText(value.text, value.prefix);
  if (words.words.empty()) return QueryNode(QueryNode::Type::kAll);
  if (value.prefix && words.words.back().size() < 2) {
    Refuse(value.begin, "the beginning of a word must have two letters at least; add some before the \"*\"");
  }
  QueryNode node(type);
  node.text = value.text;
  node.phrase = value.phrase;
  node.prefix = value.prefix;
  return node;
}

QueryNode ConditionReader::Field(const std::string& name, size_t begin, const ConditionValue& value) const {
  switch (ConditionTypeOf(name)) {
    case ConditionType::kName:
      return Words(QueryNode::Type::kName, value);
    case ConditionType::kKind:
      return Kinds(value);
    case ConditionType::kExt:
      return Extensions(value);
    case ConditionType::kPath:
      return Path(value);
    case ConditionType::kSize:
      return Size(value);
    case ConditionType::kDate:
      return Date(value);
    case ConditionType::kNone:
      break;
  }
  const RangeField* range = FindRangeField(name);
  return range != nullptr ? Number(*range, value) : WordsInField(name, begin, value);
}

QueryNode ConditionReader::WordsInField(const std::string& name, size_t begin, const ConditionValue& value) const {
  std::vector<std::string> fields = FriendlyFields(name);
  if (fields.empty() && name != field::kTextContent && !Schema::IsSearchable(name)) {
    Refuse(begin, "field \"" + name + "\" cannot be searched by words; use path:, size:, date:, kind: or ext:");
  }
  if (fields.empty()) fields.push_back(name);
  ConditionValue known = value;
  if (fields.front() == fileindex::elastic::kKOVAMDOwnerUserID) known.text = UserNumber(value);
  if (fields.front() == fileindex::elastic::kKOVAMDOwnerGroupID) known.text = GroupNumber(value);
  QueryNode node = Words(QueryNode::Type::kField, known);
  if (node.type == QueryNode::Type::kField) node.fields = std::move(fields);
  return node;
}

std::string ConditionReader::UserNumber(const ConditionValue& value) const {
  if (value.text.find_first_not_of("0123456789") == std::string::npos) return value.text;
  const std::optional<int64_t> number = UserNumberOf(value.text);
  if (!number.has_value()) Refuse(value.begin, "there is no user \"" + value.text + "\"; give a user's name or number");
  return std::to_string(*number);
}

std::string ConditionReader::GroupNumber(const ConditionValue& value) const {
  if (value.text.find_first_not_of("0123456789") == std::string::npos) return value.text;
  const std::optional<int64_t> number = GroupNumberOf(value.text);
  if (!number.has_value()) Refuse(value.begin, "there is no group \"" + value.text + "\"; give its name or number");
  return std::to_string(*number);
}

QueryNode ConditionReader::Kinds(const ConditionValue& value) const {
  QueryNode kinds(QueryNode::Type::kKind);
  QueryNode either(QueryNode::Type::kOr);
  for (const std::string& part : Parts(value)) {
    const std::optional<NamedKind> kind = FindKind(part);
    if (!kind.has_value()) Refuse(value.begin, "there is no kind \"" + part + "\"; known are " + kKnownKinds);
    if (kind->kind.has_value()) {
      kinds.kinds.push_back(*kind->kind);
      continue;
    }
    std::istringstream extensions{std::string(kind->extensions)};
    for (std::string extension; extensions >> extension;) {
      either.children.emplace_back(QueryNode::Type::kExt).text = extension;
    }
  }
  if (either.children.empty()) return kinds;
  if (!kinds.kinds.empty()) either.children.push_back(std::move(kinds));
  return OnlyOr(std::move(either));
}

QueryNode ConditionReader::Extensions(const ConditionValue& value) const {
  QueryNode either(QueryNode::Type::kOr);
  for (const std::string& part : Parts(value)) {
    QueryNode node(QueryNode::Type::kExt);
    node.text = base::LowerAscii(part.front() == '.' ? part.substr(1) : part);
    either.children.push_back(std::move(node));
  }
  return OnlyOr(std::move(either));
}

/// The parts of "a,b,c".
std::vector<std::string> ConditionReader::Parts(const ConditionValue& value) const {
  std::vector<std::string> parts(1);
  for (const char c : value.text) {
    if (c == ',') {
      parts.emplace_back();
    } else {
      parts.back() += c;
    }
  }
  const bool hole = std::any_of(parts.begin(), parts.end(), [](const std::string& part) { return part.empty(); });
  if (hole) Refuse(value.begin, "there is nothing beside a \",\"; remove it");
  return parts;
}

QueryNode ConditionReader::Path(const ConditionValue& value) const {
  if (value.text.front() != '/') {
    Refuse(value.begin, "a folder is given by its full path, such as path:/volume1/photo; begin it with /");
  }
  QueryNode node(QueryNode::Type::kPath);
  node.text = value.text;
  while (!node.text.empty() && node.text.back() == '/') node.text.pop_back();
  return node;
}

QueryNode ConditionReader::Size(const ConditionValue& value) const {
  const std::optional<ValueRange> range = ParseSizeRange(value.text);
  if (!range.has_value()) {
    Refuse(value.begin, "\"" + value.text + "\" is no size; write size:>10M, size:1k..2M or size:700");
  }
  return RangeNode(QueryNode::Type::kSize, *range);
}

QueryNode ConditionReader::Date(const ConditionValue& value) const {
  const std::optional<ValueRange> range = ParseDateRange(value.text, now_);
  if (!range.has_value()) {
    Refuse(value.begin, "\"" + value.text +
                            "\" is no date; write date:2024, date:2024-01..2024-06, date:>2024-01-31, date:7d or "
                            "date:today");
  }
  return RangeNode(QueryNode::Type::kDate, *range);
}

QueryNode ConditionReader::Number(const RangeField& field, const ConditionValue& value) const {
  const std::optional<ValueRange> range = field.parse(value.text, now_);
  if (!range.has_value()) {
    Refuse(value.begin, "\"" + value.text + "\" does not fit; write " + field.example);
  }
  QueryNode node = RangeNode(QueryNode::Type::kRange, *range);
  node.fields = field.fields;
  return node;
}

}  // namespace ferrox::engine
