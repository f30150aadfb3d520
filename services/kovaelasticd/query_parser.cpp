#include <algorithm>

#include "common/log.h"
#include "services/kovaelasticd/query.h"
#include "services/kovaelasticd/query_values.h"
#include "services/kovaelasticd/schema.h"
#include "services/kovaelasticd/words.h"

namespace ferrox::engine {

namespace {

bool IsBlank(char c) { return c == ' ' || (c >= '\t' && c <= '\r'); }

bool IsNameChar(char c) {
  return (c >= 'a' && c <= 'z') || (c >= 'A' && c <= 'Z') || (c >= '0' && c <= '9') || c == '_';
}

QueryNode Node(QueryNode::Type type) {
  QueryNode node;
  node.type = type;
  return node;
}

/// One value as written: the text without quotes, and how it was written.
struct Value {
  std::string text;
  bool phrase = false;
  bool prefix = false;
  size_t begin = 0;
};

class Parser {
 public:
  Parser(std::string_view text, int64_t now) : text_(text), now_(now) {}

  QueryNode Parse() {
    if (text_.size() > kQueryMaxBytes) {
      Refuse(0, "the query is longer than " + std::to_string(kQueryMaxBytes) + " bytes; shorten it");
    }
    if (text_.find('\0') != std::string_view::npos) Refuse(0, "the query holds a NUL byte; leave it out");
    QueryNode query = ParseOr();
    SkipBlanks();
    if (pos_ < text_.size()) Refuse(pos_, "this \")\" closes nothing; remove it or open it before");
    if (terms_ == 0) Refuse(0, "there is nothing to look for; give a word, or a condition such as kind:image");
    return query;
  }

 private:
  [[noreturn]] void Refuse(size_t at, const std::string& sentence) {
    size_t character = 1;
    for (size_t pos = 0; pos < std::min(at, text_.size()); pos += DecodeAt(text_, pos).length_bytes) ++character;
    throw Error(Error::kEngineBadRequest, "query, character " + std::to_string(character) + ": " + sentence);
  }

  void SkipBlanks() {
    while (pos_ < text_.size() && IsBlank(text_[pos_])) ++pos_;
  }

  /// Takes the word at hand when it is `word` and ends there.
  bool TakeKeyword(std::string_view word) {
    if (text_.substr(pos_, word.size()) != word) return false;
    const size_t end = pos_ + word.size();
    if (end < text_.size() && !IsBlank(text_[end]) && text_[end] != '(') return false;
    pos_ = end;
    return true;
  }

  bool AtEnd() {
    SkipBlanks();
    return pos_ >= text_.size() || text_[pos_] == ')';
  }

  QueryNode ParseOr() {
    QueryNode either = Node(QueryNode::Type::kOr);
    do {
      const size_t begin = pos_;
      either.children.push_back(ParseAnd());
      if (either.children.back().children.empty()) {
        if (either.children.size() > 1 || !AtEnd()) Refuse(begin, "OR needs a condition on both sides; add one");
      }
      SkipBlanks();
    } while (TakeKeyword("OR"));
    for (QueryNode& child : either.children) {
      if (child.children.size() != 1) continue;
      QueryNode only = std::move(child.children.front());
      child = std::move(only);
    }
    if (either.children.size() > 1) return either;
    QueryNode only = std::move(either.children.front());
    return only;
  }

  QueryNode ParseAnd() {
    QueryNode all = Node(QueryNode::Type::kAnd);
    while (!AtEnd()) {
      const size_t begin = pos_;
      if (TakeKeyword("OR")) {
        pos_ = begin;
        break;
      }
      if (TakeKeyword("AND")) {
        if (all.children.empty() || AtEnd()) Refuse(begin, "AND needs a condition on both sides; add one");
        continue;
      }
      QueryNode node = ParseUnary();
      if (node.type != QueryNode::Type::kAll) all.children.push_back(std::move(node));
    }
    return all;
  }

  QueryNode ParseUnary() {
    SkipBlanks();
    const size_t begin = pos_;
    const bool minus = text_[pos_] == '-' && pos_ + 1 < text_.size() && !IsBlank(text_[pos_ + 1]);
    if (minus) {
      ++pos_;
    } else if (!TakeKeyword("NOT")) {
      return ParsePrimary();
    }
    if (AtEnd()) Refuse(begin, "NOT needs a condition behind it; add one");
    Deeper(begin);
    QueryNode node = Node(QueryNode::Type::kNot);
    node.children.push_back(ParseUnary());
    --depth_;
    // What asks for nothing excludes nothing.
    return node.children.front().type == QueryNode::Type::kAll ? Node(QueryNode::Type::kAll) : node;
  }

  void Deeper(size_t begin) {
    if (++depth_ > kQueryMaxDepth) {
      Refuse(begin, "conditions are nested deeper than " + std::to_string(kQueryMaxDepth) + "; simplify the query");
    }
  }

  QueryNode ParsePrimary() {
    const size_t begin = pos_;
    if (text_[pos_] == '(') {
      Deeper(begin);
      ++pos_;
      QueryNode inner = ParseOr();
      if (pos_ >= text_.size()) Refuse(begin, "this \"(\" is not closed; add a \")\"");
      ++pos_;
      --depth_;
      const bool empty = inner.type == QueryNode::Type::kAnd && inner.children.empty();
      return empty ? Node(QueryNode::Type::kAll) : inner;
    }
    std::string name;
    size_t end = pos_;
    while (end < text_.size() && IsNameChar(text_[end])) ++end;
    if (end > pos_ && end < text_.size() && text_[end] == ':') {
      name = text_.substr(pos_, end - pos_);
      pos_ = end + 1;
    }
    const Value value = ParseValue();
    if (!name.empty() && value.text.empty()) Refuse(begin, "\"" + name + ":\" needs a value behind it; add one");
    QueryNode node = name.empty() ? WordsNode(QueryNode::Type::kText, value) : FieldNode(name, begin, value);
    if (node.type != QueryNode::Type::kAll && ++terms_ > kQueryMaxTerms) {
      Refuse(begin, "there are more than " + std::to_string(kQueryMaxTerms) + " conditions; leave some out");
    }
    return node;
  }

  Value ParseValue() {
    Value value;
    value.begin = pos_;
    if (pos_ < text_.size() && text_[pos_] == '"') {
      const size_t close = text_.find('"', pos_ + 1);
      if (close == std::string_view::npos) Refuse(pos_, "this quote is not closed; add a \" at its end");
      value.text = text_.substr(pos_ + 1, close - pos_ - 1);
      value.phrase = true;
      pos_ = close + 1;
    } else {
      while (pos_ < text_.size() && !IsBlank(text_[pos_]) && !IsOneOfSpecial(text_[pos_])) value.text += text_[pos_++];
    }
    if (value.phrase && pos_ < text_.size() && text_[pos_] == '*') {
      ++pos_;
      value.prefix = true;
    }
    if (!value.phrase && value.text.size() > 1 && value.text.back() == '*') {
      value.text.pop_back();
      value.prefix = true;
    }
    return value;
  }

  static bool IsOneOfSpecial(char c) { return c == '(' || c == ')' || c == '"'; }

  /// A node for words; one that asks for nothing when there is no letter or digit in them.
  QueryNode WordsNode(QueryNode::Type type, const Value& value) {
    if (!value.phrase && value.text.size() > 1 && value.text.front() == '*') {
      Refuse(value.begin, "a \"*\" can stand only at the end of a word; name:port finds it inside names too");
    }
    const QueryWords words = SplitQueryText(value.text, value.prefix);
    if (words.words.empty()) return Node(QueryNode::Type::kAll);
    if (value.prefix && words.words.back().size() < 2) {
      Refuse(value.begin, "the beginning of a word must have two letters at least; add some before the \"*\"");
    }
    QueryNode node = Node(type);
    node.text = value.text;
    node.phrase = value.phrase;
    node.prefix = value.prefix;
    return node;
  }

  QueryNode FieldNode(const std::string& name, size_t begin, const Value& value) {
    std::string lower = name;
    std::transform(lower.begin(), lower.end(), lower.begin(),
                   [](char c) { return c >= 'A' && c <= 'Z' ? static_cast<char>(c | 0x20) : c; });
    if (lower == "kind") return KindNode(value);
    if (lower == "ext" || name == field::kExtension) return ExtNode(value);
    if (lower == "path") return PathNode(value);
    if (lower == "size") return SizeNode(value);
    if (lower == "date") return DateNode(value);
    if (const RangeField* field = FindRangeField(lower)) return NumberNode(*field, value);
    const bool is_name =
        lower == "name" || name == field::kFsName || name == field::kSearchName || name == field::kDisplayName;
    if (is_name) return NameNode(value);
    return WordsInField(name, begin, value);
  }

  QueryNode WordsInField(const std::string& name, size_t begin, const Value& value) {
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
    Value known = value;
    if (fields.front() == "KOVAMDOwnerUserID") known.text = UserNumber(value);
    if (fields.front() == "KOVAMDOwnerGroupID") known.text = GroupNumber(value);
    QueryNode node = WordsNode(QueryNode::Type::kField, known);
    if (node.type == QueryNode::Type::kField) node.fields = std::move(fields);
    return node;
  }

  std::string UserNumber(const Value& value) {
    if (value.text.find_first_not_of("0123456789") == std::string::npos) return value.text;
    const std::optional<int64_t> number = UserNumberOf(value.text);
    if (!number.has_value())
      Refuse(value.begin, "there is no user \"" + value.text + "\"; give a user's name or number");
    return std::to_string(*number);
  }

  std::string GroupNumber(const Value& value) {
    if (value.text.find_first_not_of("0123456789") == std::string::npos) return value.text;
    const std::optional<int64_t> number = GroupNumberOf(value.text);
    if (!number.has_value()) Refuse(value.begin, "there is no group \"" + value.text + "\"; give its name or number");
    return std::to_string(*number);
  }

  QueryNode NameNode(Value value) {
    if (!value.phrase && value.text.size() > 1 && value.text.front() == '*') value.text.erase(0, 1);
    return WordsNode(QueryNode::Type::kName, value);
  }

  QueryNode KindNode(const Value& value) {
    QueryNode node = Node(QueryNode::Type::kKind);
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

  QueryNode ExtNode(const Value& value) {
    QueryNode either = Node(QueryNode::Type::kOr);
    for (const std::string& part : Parts(value)) {
      QueryNode node = Node(QueryNode::Type::kExt);
      node.text = part;
      if (node.text.front() == '.') node.text.erase(0, 1);
      std::transform(node.text.begin(), node.text.end(), node.text.begin(),
                     [](char c) { return c >= 'A' && c <= 'Z' ? static_cast<char>(c | 0x20) : c; });
      either.children.push_back(std::move(node));
    }
    if (either.children.size() > 1) return either;
    QueryNode only = std::move(either.children.front());
    return only;
  }

  /// The parts of "a,b,c".
  std::vector<std::string> Parts(const Value& value) {
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

  QueryNode PathNode(const Value& value) {
    if (value.text.front() != '/') {
      Refuse(value.begin, "path: takes the full path of a folder, such as path:/volume1/photo; begin it with /");
    }
    QueryNode node = Node(QueryNode::Type::kPath);
    node.text = value.text;
    while (!node.text.empty() && node.text.back() == '/') node.text.pop_back();
    return node;
  }

  QueryNode SizeNode(const Value& value) {
    const std::optional<ValueRange> range = ParseSizeRange(value.text);
    if (!range.has_value()) {
      Refuse(value.begin, "\"" + value.text + "\" is no size; write size:>10M, size:1k..2M or size:700");
    }
    return RangeNode(QueryNode::Type::kSize, *range);
  }

  QueryNode DateNode(const Value& value) {
    const std::optional<ValueRange> range = ParseDateRange(value.text, now_);
    if (!range.has_value()) {
      Refuse(value.begin, "\"" + value.text +
                              "\" is no date; write date:2024, date:2024-01..2024-06, date:>2024-01-31, date:7d or "
                              "date:today");
    }
    return RangeNode(QueryNode::Type::kDate, *range);
  }

  QueryNode NumberNode(const RangeField& field, const Value& value) {
    const std::optional<ValueRange> range = field.parse(value.text, now_);
    if (!range.has_value()) {
      Refuse(value.begin, "\"" + value.text + "\" does not fit; write " + field.example);
    }
    QueryNode node = RangeNode(QueryNode::Type::kRange, *range);
    node.fields = field.fields;
    return node;
  }

  static QueryNode RangeNode(QueryNode::Type type, const ValueRange& range) {
    QueryNode node = Node(type);
    node.low = range.low;
    node.high = range.high;
    return node;
  }

  std::string_view text_;
  int64_t now_;
  size_t pos_ = 0;
  size_t depth_ = 0;
  size_t terms_ = 0;
};

void Print(std::string& out, const QueryNode& node);

void PrintChildren(std::string& out, const char* word, const QueryNode& node) {
  out += std::string("(") + word;
  for (const QueryNode& child : node.children) {
    out += ' ';
    Print(out, child);
  }
  out += ')';
}

void PrintWords(std::string& out, const std::string& before, const QueryNode& node) {
  out += before + (node.phrase ? "\"" + node.text + "\"" : node.text) + (node.prefix ? "*" : "");
}

std::string Join(const std::vector<std::string>& parts) {
  std::string joined;
  for (const std::string& part : parts) joined += (joined.empty() ? "" : "|") + part;
  return joined;
}

void Print(std::string& out, const QueryNode& node) {
  switch (node.type) {
    case QueryNode::Type::kAll:
      out += "all";
      break;
    case QueryNode::Type::kAnd:
      PrintChildren(out, "and", node);
      break;
    case QueryNode::Type::kOr:
      PrintChildren(out, "or", node);
      break;
    case QueryNode::Type::kNot:
      PrintChildren(out, "not", node);
      break;
    case QueryNode::Type::kText:
      PrintWords(out, "", node);
      break;
    case QueryNode::Type::kField:
      PrintWords(out, Join(node.fields) + ":", node);
      break;
    case QueryNode::Type::kName:
      PrintWords(out, "name:", node);
      break;
    case QueryNode::Type::kExt:
      out += "ext:" + node.text;
      break;
    case QueryNode::Type::kPath:
      out += "path:" + node.text;
      break;
    case QueryNode::Type::kKind:
      out += "kind:";
      for (const int32_t kind : node.kinds) out += std::to_string(kind);
      break;
    case QueryNode::Type::kSize:
    case QueryNode::Type::kDate:
    case QueryNode::Type::kRange:
      out += node.type == QueryNode::Type::kSize ? "size" : node.type == QueryNode::Type::kDate ? "date" : "";
      out += Join(node.fields) + ":";
      out += std::to_string(node.low) + ".." + std::to_string(node.high);
      break;
  }
}

}  // namespace

QueryNode ParseQuery(std::string_view text, int64_t now) { return Parser(text, now).Parse(); }

std::string PrintQuery(const QueryNode& query) {
  std::string out;
  Print(out, query);
  return out;
}

}  // namespace ferrox::engine
