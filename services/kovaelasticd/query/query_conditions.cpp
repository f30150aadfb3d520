#include "services/kovaelasticd/query/query_conditions.h"

#include <algorithm>
#include <optional>

#include "base/text.h"
#include "common/error.h"
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

}  // namespace

void ConditionReader::Refuse(size_t at, const std::string& sentence) const {
  size_t character = 1;
  for (size_t pos = 0; pos < std::min(at, query_.size()); pos += DecodeAt(query_, pos).length_bytes) ++character;
  throw Error(Error::kEngineBadRequest, "query, character " + std::to_string(character) + ": " + sentence);
}

/// A node for words; one that asks for nothing when there is no letter or digit in them.
QueryNode ConditionReader::Words(QueryNode::Type type, const ConditionValue& value) const {
  if (!value.phrase && value.text.size() > 1 && value.text.front() == '*') {
    Refuse(value.begin, "a \"*\" can stand only at the end of a word; name:port finds it inside names too");
  }
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
  const std::string lower = base::LowerAscii(name);
  if (lower == "kind") return Kinds(value);
  if (lower == "ext" || name == field::kExtension) return Extensions(value);
  if (lower == "path") return Path(value);
  if (lower == "size") return Size(value);
  if (lower == "date") return Date(value);
  if (const RangeField* field = FindRangeField(lower)) return Number(*field, value);
  const bool is_name =
      lower == "name" || name == field::kFsName || name == field::kSearchName || name == field::kDisplayName;
  if (is_name) return Name(value);
  return WordsInField(name, begin, value);
}

QueryNode ConditionReader::WordsInField(const std::string& name, size_t begin, const ConditionValue& value) const {
  std::vector<std::string> fields = FriendlyFields(name);
  const bool full_name = name.compare(0, 4, "KOVA") == 0 || name.compare(0, 7, "_KOVAMD") == 0;
  if (fields.empty() && !full_name) {
    Refuse(begin, "there is no field \"" + name + "\"; known are " + KnownFields() +
                      "; to look for the text as it stands, put it in quotes");
  }
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

QueryNode ConditionReader::Name(ConditionValue value) const {
  if (!value.phrase && value.text.size() > 1 && value.text.front() == '*') value.text.erase(0, 1);
  return Words(QueryNode::Type::kName, value);
}

QueryNode ConditionReader::Kinds(const ConditionValue& value) const {
  QueryNode node(QueryNode::Type::kKind);
  for (const std::string& part : Parts(value)) {
    const std::optional<int32_t> kind = ParseKind(part);
    if (!kind.has_value()) {
      Refuse(value.begin,
             "there is no kind \"" + part + "\"; known are document, audio, video, image, folder and other");
    }
    node.kinds.push_back(*kind);
  }
  return node;
}

QueryNode ConditionReader::Extensions(const ConditionValue& value) const {
  QueryNode either(QueryNode::Type::kOr);
  for (const std::string& part : Parts(value)) {
    QueryNode node(QueryNode::Type::kExt);
    node.text = base::LowerAscii(part.front() == '.' ? part.substr(1) : part);
    either.children.push_back(std::move(node));
  }
  if (either.children.size() > 1) return either;
  QueryNode only = std::move(either.children.front());
  return only;
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
    Refuse(value.begin, "path: takes the full path of a folder, such as path:/volume1/photo; begin it with /");
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
