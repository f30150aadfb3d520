#include <string>
#include <string_view>
#include <utility>

#include "services/kovaelasticd/query/number_run.h"
#include "services/kovaelasticd/query/query.h"
#include "services/kovaelasticd/query/query_conditions.h"

namespace ferrox::engine {

namespace {

bool IsBlank(char c) { return c == ' ' || (c >= '\t' && c <= '\r'); }

bool IsNameChar(char c) {
  return (c >= 'a' && c <= 'z') || (c >= 'A' && c <= 'Z') || (c >= '0' && c <= '9') || c == '_';
}

/// Every hit must have each of these words.
void Require(QueryNode& node) {
  node.required = node.type == QueryNode::Type::kText;
  for (QueryNode& child : node.children) Require(child);
}

/// Reads the grammar, by recursive descent; a ConditionReader reads the single conditions.
///
///   or        = and { "OR" and }
///   and       = [ unary { [ "AND" ] unary } ]
///   unary     = ( "-" | "NOT" | "+" ) unary | primary
///   primary   = "(" or ")" | [ name ":" ] value
///   value     = "\"" text "\"" [ "*" ] | word
///
/// A value without letters and digits asks for nothing: its node is kAll, and is left out of what it is joined with.
/// Words are required behind "+", in quotes, within parentheses, beside OR, and all of them where there is an AND.
class Parser {
 public:
  Parser(std::string_view text, int64_t now) : text_(text), conditions_(text, now) {}

  QueryNode Parse() {
    if (text_.size() > kQueryMaxBytes) {
      conditions_.Refuse(0, "the query is longer than " + std::to_string(kQueryMaxBytes) + " bytes; shorten it");
    }
    if (text_.find('\0') != std::string_view::npos) conditions_.Refuse(0, "the query holds a NUL byte; leave it out");
    QueryNode query = ParseOr();
    SkipBlanks();
    if (pos_ < text_.size()) conditions_.Refuse(pos_, "this \")\" closes nothing; remove it or open it before");
    if (!asks_) {
      const bool blank = text_.find_first_not_of(" \t\n\v\f\r") == std::string_view::npos;
      conditions_.Refuse(0, std::string(blank ? "there is nothing to look for; "
                                              : "the query has no letters or digits to look for: ") +
                                "give a word, or a condition such as kind:image");
    }
    if (has_and_) Require(query);
    return query;
  }

 private:
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
    QueryNode either(QueryNode::Type::kOr);
    do {
      const size_t begin = pos_;
      either.children.push_back(ParseAnd());
      if (either.children.back().children.empty()) {
        if (either.children.size() > 1 || !AtEnd())
          conditions_.Refuse(begin, "OR needs a condition on both sides; add one");
      }
      SkipBlanks();
    } while (TakeKeyword("OR"));
    for (QueryNode& child : either.children) {
      if (child.children.size() != 1) continue;
      QueryNode only = std::move(child.children.front());
      child = std::move(only);
    }
    if (either.children.size() > 1) {
      Require(either);
      return either;
    }
    QueryNode only = std::move(either.children.front());
    return only;
  }

  QueryNode ParseAnd() {
    QueryNode all(QueryNode::Type::kAnd);
    NumberRun run(text_);
    while (!AtEnd()) {
      const size_t begin = pos_;
      if (TakeKeyword("OR")) {
        pos_ = begin;
        break;
      }
      if (TakeKeyword("AND")) {
        if (all.children.empty() || AtEnd()) conditions_.Refuse(begin, "AND needs a condition on both sides; add one");
        has_and_ = true;
        run.End();
        continue;
      }
      QueryNode node = ParseUnary();
      if (node.type == QueryNode::Type::kAll) continue;
      all.children.push_back(std::move(node));
      run.Add(all.children, begin, pos_);
    }
    return all;
  }

  /// Whether `sign` is at hand, and before something: signs alone, such as "-" and "--", are words without letters.
  bool IsSign(char sign) const {
    if (text_[pos_] != sign) return false;
    const size_t behind = text_.find_first_not_of("+-", pos_);
    return behind != std::string_view::npos && !IsBlank(text_[behind]) && text_[behind] != ')';
  }

  QueryNode ParseUnary() {
    SkipBlanks();
    const size_t begin = pos_;
    if (IsSign('+')) {
      pos_ = text_.find_first_not_of('+', pos_);
      QueryNode node = ParseUnary();
      Require(node);
      return node;
    }
    if (IsSign('-')) {
      ++pos_;
    } else if (!TakeKeyword("NOT")) {
      return ParsePrimary();
    }
    if (AtEnd()) conditions_.Refuse(begin, "NOT needs a condition behind it; add one");
    Deeper(begin);
    QueryNode node(QueryNode::Type::kNot);
    node.children.push_back(ParseUnary());
    --depth_;
    // What asks for nothing excludes nothing.
    return node.children.front().type == QueryNode::Type::kAll ? QueryNode(QueryNode::Type::kAll) : node;
  }

  void Deeper(size_t begin) {
    if (++depth_ > kQueryMaxDepth) {
      conditions_.Refuse(
          begin, "conditions are nested deeper than " + std::to_string(kQueryMaxDepth) + "; simplify the query");
    }
  }

  QueryNode ParsePrimary() {
    const size_t begin = pos_;
    if (text_[pos_] == '(') {
      Deeper(begin);
      ++pos_;
      QueryNode inner = ParseOr();
      if (pos_ >= text_.size()) conditions_.Refuse(begin, "this \"(\" is not closed; add a \")\"");
      ++pos_;
      --depth_;
      if (inner.type == QueryNode::Type::kAnd && inner.children.empty()) return QueryNode(QueryNode::Type::kAll);
      Require(inner);
      if (!inner.children.empty()) Count(inner, begin);
      return inner;
    }
    std::string name;
    size_t end = pos_;
    while (end < text_.size() && IsNameChar(text_[end])) ++end;
    if (end > pos_ && end < text_.size() && text_[end] == ':') {
      name = text_.substr(pos_, end - pos_);
      pos_ = end + 1;
    }
    const ConditionValue value = ParseValue();
    if (!name.empty() && value.text.empty())
      conditions_.Refuse(begin, "\"" + name + ":\" needs a value behind it; add one");
    QueryNode node =
        name.empty() ? conditions_.Words(QueryNode::Type::kText, value) : conditions_.Field(name, begin, value);
    if (value.phrase) Require(node);
    Count(node, begin);
    return node;
  }

  /// Plain words are as many as fit into the query.
  void Count(const QueryNode& node, size_t begin) {
    if (node.type == QueryNode::Type::kAll) return;
    asks_ = true;
    if (node.type != QueryNode::Type::kText && ++terms_ > kQueryMaxTerms) {
      conditions_.Refuse(begin,
                         "there are more than " + std::to_string(kQueryMaxTerms) + " conditions; leave some out");
    }
  }

  ConditionValue ParseValue() {
    ConditionValue value;
    value.begin = pos_;
    if (pos_ < text_.size() && text_[pos_] == '"') {
      const size_t close = text_.find('"', pos_ + 1);
      if (close == std::string_view::npos) conditions_.Refuse(pos_, "this quote is not closed; add a \" at its end");
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

  const std::string_view text_;
  const ConditionReader conditions_;
  size_t pos_ = 0;        ///< what is to be read next
  size_t depth_ = 0;      ///< of the parentheses and NOTs that are open
  size_t terms_ = 0;      ///< conditions so far, apart from plain words
  bool asks_ = false;     ///< there was a word or a condition
  bool has_and_ = false;  ///< "AND" was written
};

}  // namespace

QueryNode ParseQuery(std::string_view text, int64_t now) { return Parser(text, now).Parse(); }

}  // namespace ferrox::engine
