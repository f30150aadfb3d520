#include <optional>
#include <string>
#include <string_view>
#include <utility>
#include <vector>

#include "common/error.h"
#include "services/kovaelasticd/query/field_names.h"
#include "services/kovaelasticd/query/field_start.h"
#include "services/kovaelasticd/query/number_run.h"
#include "services/kovaelasticd/query/query.h"
#include "services/kovaelasticd/query/query_conditions.h"
#include "services/kovaelasticd/query/query_lexer.h"

namespace ferrox::engine {

namespace {

/// Every hit must have each of these words.
void Require(QueryNode& node) {
  node.required = node.type == QueryNode::Type::kText;
  for (QueryNode& child : node.children) Require(child);
}

/// Reads the grammar, by recursive descent; a ConditionReader reads the single conditions.
///
///   or        = and { ( "OR" | "|" ) and }
///   and       = [ unary { [ "AND" ] unary } ]
///   unary     = ( "-" | "NOT" | "+" ) unary | primary
///   primary   = "(" or ")" | [ field ] value             field: see FieldAt
///   value     = "\"" text "\"" [ "*" ] | word             see ReadQueryValue
///
/// A value without letters and digits asks for nothing: its node is kAll, and is left out of what it is joined with.
/// Words are required behind "+", in quotes, within parentheses, beside OR, and all of them where there is an AND.
class Parser {
 public:
  Parser(std::string_view text, int64_t now, std::vector<std::string>* hints)
      : text_(text), conditions_(text, now, hints) {}

  QueryNode Parse() {
    if (text_.size() > kQueryMaxBytes) {
      conditions_.Refuse(0, "the query is longer than " + std::to_string(kQueryMaxBytes) + " bytes; shorten it");
    }
    if (text_.find('\0') != std::string_view::npos) conditions_.Refuse(0, "the query holds a NUL byte; leave it out");
    QueryNode query = ParseOr();
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
    while (pos_ < text_.size() && IsQueryBlank(text_[pos_])) ++pos_;
  }

  /// Takes the word at hand when it is `word` and ends there.
  bool TakeKeyword(std::string_view word) {
    if (text_.substr(pos_, word.size()) != word) return false;
    const size_t end = pos_ + word.size();
    if (end < text_.size() && !IsQueryBlank(text_[end]) && text_[end] != '(') return false;
    pos_ = end;
    return true;
  }

  bool AtEnd() {
    SkipBlanks();
    return pos_ >= text_.size() || (text_[pos_] == ')' && groups_ > 0);
  }

  /// "|" and "||" that stand alone are OR where there is something on both sides, as not in the frame of a table.
  bool TakeBar() { return TakeKeyword("||") || TakeKeyword("|"); }

  bool IsOrAhead() {
    const size_t begin = pos_;
    const bool is_or = TakeKeyword("OR") || TakeBar();
    pos_ = begin;
    return is_or;
  }

  QueryNode ParseOr() {
    QueryNode either(QueryNode::Type::kOr);
    either.children.push_back(ParseAnd());
    while (!AtEnd()) {
      const size_t begin = pos_;
      const bool bar = TakeBar();
      if (!bar) (void)TakeKeyword("OR");
      QueryNode next = ParseAnd();
      const bool nothing_before = either.children.back().children.empty();
      if (!bar && (nothing_before || next.children.empty())) {
        conditions_.Refuse(begin, "OR needs a condition on both sides; add one");
      }
      if (nothing_before) {
        either.children.back() = std::move(next);
      } else if (!next.children.empty()) {
        either.children.push_back(std::move(next));
      }
    }
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
      if (IsOrAhead()) break;
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
    return behind != std::string_view::npos && !IsQueryBlank(text_[behind]) && text_[behind] != ')';
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
      ++groups_;
      QueryNode inner = ParseOr();
      if (pos_ >= text_.size()) conditions_.Refuse(begin, "this \"(\" is not closed; add a \")\"");
      ++pos_;
      --groups_;
      --depth_;
      if (inner.type == QueryNode::Type::kAnd && inner.children.empty()) return QueryNode(QueryNode::Type::kAll);
      Require(inner);
      if (!inner.children.empty()) Count(inner, begin);
      return inner;
    }
    const std::optional<FieldStart> field = FieldAt(text_, begin);
    QueryNode node = field.has_value() ? ParseField(*field) : ParseWords();
    Count(node, begin);
    return node;
  }

  ConditionValue ReadValue() {
    ConditionValue value = ReadQueryValue(text_, pos_, groups_ > 0);
    if (value.text.empty() && text_.substr(pos_, 1) == "\"") {
      conditions_.Refuse(pos_, "this quote is not closed; add a \" at its end");
    }
    return value;
  }

  QueryNode ParseWords() {
    const ConditionValue value = ReadValue();
    if (!value.phrase) HintAtField(value.text);
    QueryNode node = conditions_.Words(QueryNode::Type::kText, value);
    if (value.phrase) Require(node);
    return node;
  }

  /// For "autor:ada".
  void HintAtField(const std::string& word) {
    const size_t colon = word.find(':');
    if (colon == std::string::npos || colon + 1 == word.size()) return;
    const std::string meant = FieldMeantBy(std::string_view(word).substr(0, colon));
    if (meant.empty()) return;
    conditions_.Hint("\"" + word.substr(0, colon) + ":\" is no field, so it is looked for as text; there is " + meant +
                     ":");
  }

  QueryNode ParseField(const FieldStart& field) {
    const size_t begin = pos_;
    pos_ = field.value;
    try {
      ConditionValue value = ReadValue();
      if (value.text.empty()) {
        conditions_.Refuse(begin, "\"" + field.name + ":\" needs a value behind it; add one");
      }
      value.text.insert(0, field.sign);
      return conditions_.Field(field.name, begin, value);
    } catch (const Error&) {
      if (field.certain) throw;
    }
    pos_ = begin;
    return ParseWords();
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

  const std::string_view text_;
  const ConditionReader conditions_;
  size_t pos_ = 0;        ///< what is to be read next
  size_t depth_ = 0;      ///< of the parentheses and NOTs that are open
  size_t groups_ = 0;     ///< parentheses that are open
  size_t terms_ = 0;      ///< conditions so far, apart from plain words
  bool asks_ = false;     ///< there was a word or a condition
  bool has_and_ = false;  ///< "AND" was written
};

}  // namespace

QueryNode ParseQuery(std::string_view text, int64_t now, std::vector<std::string>* hints) {
  return Parser(text, now, hints).Parse();
}

}  // namespace ferrox::engine
