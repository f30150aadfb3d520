#include "services/kovaelasticd/query/query_conditions.h"

#include <algorithm>
#include <optional>
#include <sstream>
#include <utility>

#include "base/text.h"
#include "common/error.h"
#include "services/kovaelasticd/query/field_names.h"
#include "services/kovaelasticd/query/kinds.h"
#include "services/kovaelasticd/query/query_dates.h"
#include "services/kovaelasticd/query/query_text.h"
#include "services/kovaelasticd/query/query_values.h"
#include "services/kovaelasticd/query/query_words.h"
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

QueryNode ExtensionNode(std::string extension) {
  QueryNode node(QueryNode::Type::kExt);
  node.text = std::move(extension);
  return node;
}

std::string Quoted(const std::string& text) { return "\"" + text + "\""; }

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

/// The words of fields are known by their beginnings: of "rep*t" that is looked for.
ConditionValue ConditionReader::WithoutWildcards(QueryNode::Type type, ConditionValue value) const {
  const size_t begin = value.text.find_first_not_of('*');
  value.text.erase(0, std::min(begin, value.text.size()));
  const std::string before(BeforeWildcard(value.text));
  if (type != QueryNode::Type::kField || before.size() < 2) return value;
  Hint(Quoted(value.text) + " is looked for as " + before + "*: of fields, only name: takes a \"*\" within a word");
  value.text = before;
  value.prefix = true;
  return value;
}

/// A node for words; one that asks for nothing when there is no letter or digit in them.
QueryNode ConditionReader::Words(QueryNode::Type type, const ConditionValue& given, bool is_pasted) const {
  const bool is_text = type == QueryNode::Type::kText;
  QueryNode node(type);
  if (!given.phrase && !is_pasted) {
    QueryNode either(QueryNode::Type::kOr);
    for (const std::string& extension : is_text ? ExtensionsAsked(given.text) : std::vector<std::string>()) {
      either.children.push_back(ExtensionNode(extension));
    }
    if (!either.children.empty()) return OnlyOr(std::move(either));
    node.text = type == QueryNode::Type::kField ? "" : PatternAsked(given.text + (given.prefix ? "*" : ""));
    node.pattern = node.required = !node.text.empty();
    if (node.pattern) return node;
  }
  ConditionValue value = given.phrase ? given : WithoutWildcards(type, given);
  if (is_text && !value.phrase) value.text.erase(0, SchemeBytes(value.text));
  const QueryWords words = SplitQueryText(value.text, value.prefix);
  if (words.words.empty()) return QueryNode(QueryNode::Type::kAll);
  if (value.prefix && words.words.back().size() < 2) {
    Hint(Quoted(value.text + "*") + " is looked for as " + value.text + ": a beginning must have two letters at least");
    value.prefix = false;
  }
  node.text = value.text;
  node.phrase = value.phrase;
  node.prefix = value.prefix;
  return node;
}

QueryNode ConditionReader::Field(const std::string& name, size_t begin, const ConditionValue& value) const {
  if (TakesRange(name)) {
    if (std::optional<QueryNode> range = Range(name, value)) return std::move(*range);
    RefuseRange(name, value);
  }
  switch (ConditionTypeOf(name)) {
    case ConditionType::kName:
      return Words(QueryNode::Type::kName, value);
    case ConditionType::kKind:
      return Kinds(value);
    case ConditionType::kExt:
      return Extensions(value);
    case ConditionType::kPath:
      return Path(value);
    case ConditionType::kType:
      return Type(name, begin, value);
    case ConditionType::kHas:
      return Has(value);
    default:
      return WordsInField(name, begin, value);
  }
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
    const std::string lower = base::LowerAscii(part);
    if (lower == "file" || lower == "files") {
      kinds.kinds.insert(kinds.kinds.end(), {kDocument, kAudio, kVideo, kImage, kOther});
      continue;
    }
    if (!kind.has_value()) {
      Refuse(value.begin, "there is no kind " + Quoted(part) + "; write ext:" + lower +
                              " for files whose name ends so, or one of these kinds: " + kKnownKinds);
    }
    if (kind->kind.has_value()) {
      kinds.kinds.push_back(*kind->kind);
      continue;
    }
    std::istringstream extensions{std::string(kind->extensions)};
    for (std::string extension; extensions >> extension;) either.children.push_back(ExtensionNode(extension));
  }
  if (either.children.empty()) return kinds;
  if (!kinds.kinds.empty()) either.children.push_back(std::move(kinds));
  return OnlyOr(std::move(either));
}

/// "type:application/pdf" is the field's; "type:image" and "type:pdf" may be a kind or an extension.
QueryNode ConditionReader::Type(const std::string& name, size_t begin, const ConditionValue& value) const {
  if (FindKind(value.text).has_value()) return Kinds(value);
  QueryNode in_field = WordsInField(name, begin, value);
  const bool is_word = value.text.find_first_not_of("abcdefghijklmnopqrstuvwxyz0123456789") == std::string::npos;
  if (in_field.type != QueryNode::Type::kField || value.phrase || value.prefix || !is_word) return in_field;
  QueryNode either(QueryNode::Type::kOr);
  either.children.push_back(ExtensionNode(value.text));
  either.children.push_back(std::move(in_field));
  return either;
}

/// What is attached is part of a mail's text, and not told from it.
QueryNode ConditionReader::Has(const ConditionValue& value) const {
  const std::string what = base::LowerAscii(value.text);
  if (!what.starts_with("attach")) {
    Refuse(value.begin, "has:" + value.text + " is not known; there is has:attachment");
  }
  Hint("which mail has files attached is not known; all mail is looked through, with the text of such files");
  ConditionValue mail = value;
  mail.text = "mail";
  return Kinds(mail);
}

QueryNode ConditionReader::Extensions(const ConditionValue& value) const {
  QueryNode either(QueryNode::Type::kOr);
  for (const std::string& part : Parts(value)) {
    const size_t begin = part.find_first_not_of("*.");
    if (begin == std::string::npos) Refuse(value.begin, Quoted(part) + " is no extension; write ext:pdf");
    either.children.push_back(ExtensionNode(base::LowerAscii(part.substr(begin))));
  }
  return OnlyOr(std::move(either));
}

/// The parts of "a,b,c".
std::vector<std::string> ConditionReader::Parts(const ConditionValue& value) const {
  std::vector<std::string> parts;
  for (size_t begin = 0; begin < value.text.size();) {
    const size_t end = std::min(value.text.size(), value.text.find_first_of(",;| ", begin));
    if (end > begin) parts.push_back(value.text.substr(begin, end - begin));
    begin = end + 1;
  }
  if (parts.empty()) Refuse(value.begin, "there is nothing but signs in " + Quoted(value.text) + "; give a word");
  return parts;
}

/// "/photo/2024", "photo/2024", "\\server\photo"; "/photo/*.jpg" is a folder and a name.
QueryNode ConditionReader::Path(const ConditionValue& value) const {
  std::string path = PlaceOfAddress(value.text);
  if (path.empty()) path = value.text;
  std::replace(path.begin(), path.end(), path.find('/') == path.npos ? '\\' : '/', '/');
  const bool is_full = path.starts_with('/');
  if (!is_full && (!value.certain || path.starts_with('~') || path.starts_with('.') || path.find(':') != path.npos)) {
    Refuse(value.begin, Quoted(value.text) +
                            " is no folder; write a share and its folders, such as path:/photo/2024, "
                            "or the full path");
  }
  if (!is_full) path.insert(0, "/");
  const size_t last = path.rfind('/') + 1;
  const size_t wildcard = path.find_first_of("*?");
  QueryNode node(QueryNode::Type::kPath);
  if (wildcard < last) {
    Refuse(value.begin, "a \"*\" or \"?\" can stand only behind the last \"/\" of " + Quoted(value.text) +
                            "; write path:/photo name:IMG_*");
  }
  const bool has_name = value.prefix ? last < path.size() : wildcard != path.npos;
  node.text = has_name ? path.substr(0, last) : path;
  while (!node.text.empty() && node.text.back() == '/') node.text.pop_back();
  if (!has_name) return node;
  ConditionValue name = value;
  name.text = path.substr(last);
  QueryNode both(QueryNode::Type::kAnd);
  both.children.push_back(std::move(node));
  both.children.push_back(Words(QueryNode::Type::kName, name));
  return both;
}

/// "before:2024" and "after:2024" leave the year itself out, "since:2024" does not.
std::optional<QueryNode> ConditionReader::Range(const std::string& name, const ConditionValue& value) const {
  const ConditionType type = ConditionTypeOf(name);
  const RangeField* field = FindRangeField(name);
  std::string text = value.text;
  if (type == ConditionType::kBefore) text.insert(0, "<");
  if (type == ConditionType::kAfter) text.insert(0, base::LowerAscii(name.front()) == 'a' ? ">" : ">=");
  const std::optional<ValueRange> range = type == ConditionType::kSize ? ParseSizeRange(text)
                                          : field != nullptr           ? field->parse(text, now_)
                                                                       : ParseDateRange(text, now_);
  if (!range.has_value()) return std::nullopt;
  QueryNode node = RangeNode(type == ConditionType::kSize ? QueryNode::Type::kSize
                             : field != nullptr           ? QueryNode::Type::kRange
                                                          : QueryNode::Type::kDate,
                             *range);
  if (field != nullptr) node.fields = field->fields;
  return node;
}

void ConditionReader::RefuseRange(const std::string& name, const ConditionValue& value) const {
  if (const RangeField* field = FindRangeField(name); field != nullptr) {
    Refuse(value.begin, Quoted(value.text) + " does not fit; write " + field->example);
  }
  if (ConditionTypeOf(name) == ConditionType::kSize) {
    Refuse(value.begin, Quoted(value.text) + " is no size; write size:>10M, size:1k..2M or size:700");
  }
  const bool has_slashes = std::count(value.text.begin(), value.text.end(), '/') == 2;
  Refuse(value.begin, has_slashes
                          ? Quoted(value.text) + " may be read in two ways; write the year first, as in date:2024-03-31"
                          : Quoted(value.text) +
                                " is no date; write date:2024-03-31, date:2024-01..2024-06, "
                                "date:>2024-01-31, date:7d for the last 7 days, or date:today");
}

bool ConditionReader::IsKind(const std::string& word) { return FindKind(word).has_value(); }

}  // namespace ferrox::engine
