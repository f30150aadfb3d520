#include <iterator>
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
#include "services/kovaelasticd/query/query_cursor.h"
#include "services/kovaelasticd/query/query_lexer.h"
#include "services/kovaelasticd/query/query_text.h"
#include "services/kovaelasticd/query/query_words.h"
#include "services/kovaelasticd/query/value_range.h"

namespace ferrox::engine {

namespace {

/// The most words of a value without quotes, as in "date:last 3 weeks".
constexpr size_t kValueWordsMax = 6;

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
/// What is left without its other half is text: operators with a side missing, a quote or "(" that is not closed.
/// A value without letters and digits asks for nothing: its node is kAll, and is left out of what it is joined with.
/// Words are required behind "+", in quotes, within parentheses, beside OR, and all of them where there is an AND.
class Parser {
 public:
  Parser(const QueryText& text, int64_t now, std::vector<std::string>* hints)
      : cursor_(text), conditions_(text.text, now, hints) {
    if (text.is_cut) {
      conditions_.Hint("only the first " + std::to_string(kQueryMaxBytes) + " bytes of the query are looked for");
    }
  }

  QueryNode Parse() {
    const std::string_view text = cursor_.Text();
    if (text.find('\0') != std::string_view::npos) conditions_.Refuse(0, "the query holds a NUL byte; leave it out");
    const std::string place = PlaceOfAddress(text);
    QueryNode query = place.empty() ? ParseOr() : PlaceOrText(place);
    if (!asks_) {
      const std::string_view all = WithoutBlanks(text);
      if (all == "*" || all == "*.*") return QueryNode(QueryNode::Type::kAll);
      const bool blank = text.find_first_not_of(" \t\n\v\f\r") == std::string_view::npos;
      conditions_.Refuse(0, std::string(blank ? "there is nothing to look for; "
                                              : "the query has no letters or digits to look for: ") +
                                "give a word, or a condition such as kind:image");
    }
    if (has_and_) Require(query);
    for (const std::string& hint : HintsAtText(said_)) conditions_.Hint(hint);
    if (cursor_.HasCapitalOperators()) {
      conditions_.Hint(
          "AND, OR and NOT are words here, since all is in capitals; to leave a word out, put \"-\" before it");
    }
    return query;
  }

 private:
  /// An address may be meant as the place itself, or stand in texts.
  QueryNode PlaceOrText(const std::string& place) {
    QueryNode either(QueryNode::Type::kOr);
    either.children.emplace_back(QueryNode::Type::kPath).text = place;
    QueryNode& text = either.children.emplace_back(QueryNode::Type::kText);
    text.text = WithoutBlanks(cursor_.Text());
    text.phrase = true;
    Require(either);
    asks_ = true;
    return either;
  }

  QueryNode ParseOr() {
    QueryNode either(QueryNode::Type::kOr);
    either.children.push_back(ParseAnd());
    while (!cursor_.AtEnd()) {
      while (cursor_.TakeOr()) continue;
      said_ += "| ";
      QueryNode next = ParseAnd();
      if (either.children.back().children.empty()) {
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
    NumberRun run(cursor_.Text());
    while (!cursor_.AtEnd()) {
      const size_t begin = cursor_.Position();
      const bool is_text = all.children.empty() || all.children.back().type == QueryNode::Type::kText;
      if (cursor_.IsOrAhead(!all.children.empty(), is_text)) break;
      if (!all.children.empty() && cursor_.TakeAnd()) {
        has_and_ = true;
        run.End();
        continue;
      }
      QueryNode node = ParseUnary();
      if (node.type == QueryNode::Type::kAll) continue;
      const bool is_open = std::exchange(was_unclosed_, false);
      if (is_open && node.type == QueryNode::Type::kAnd) {
        std::move(node.children.begin(), node.children.end(), std::back_inserter(all.children));
        continue;
      }
      all.children.push_back(std::move(node));
      run.Add(all.children, begin, cursor_.Position());
    }
    return all;
  }

  QueryNode ParseUnary() {
    const size_t begin = cursor_.Position();
    if (cursor_.TakePlus()) {
      QueryNode node = ParseUnary();
      Require(node);
      return node;
    }
    if (!cursor_.TakeNot()) return ParsePrimary();
    said_ += "| ";
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
    const size_t begin = cursor_.Position();
    if (cursor_.OpenGroup()) return ParseGroup(begin);
    const std::optional<FieldStart> field = FieldAt(cursor_.Text(), begin);
    QueryNode node = field.has_value() ? ParseField(*field) : ParseWords();
    Count(node, begin);
    return node;
  }

  QueryNode ParseGroup(size_t begin) {
    Deeper(begin);
    QueryNode inner = ParseOr();
    --depth_;
    const bool is_closed = cursor_.CloseGroup();
    if (inner.type == QueryNode::Type::kAnd && inner.children.empty()) return QueryNode(QueryNode::Type::kAll);
    if (!is_closed) {
      was_unclosed_ = true;
      conditions_.Hint("a \"(\" is not closed, so it is passed over");
      return inner;
    }
    Require(inner);
    if (!inner.children.empty()) Count(inner, begin);
    return inner;
  }

  ConditionValue ReadValue() {
    ConditionValue value = cursor_.ReadValue();
    if (value.unclosed && !value.text.empty()) {
      conditions_.Hint("the quote before " + value.text + " is not closed, so it is passed over");
    }
    return value;
  }

  QueryNode ParseWords() {
    const ConditionValue value = ReadValue();
    said_ += value.phrase ? "| " : value.text + " ";
    const auto words = [&] { return conditions_.Words(QueryNode::Type::kText, value, cursor_.IsPasted()); };
    if (value.phrase || cursor_.IsPasted()) {
      QueryNode node = words();
      if (value.phrase) Require(node);
      return node;
    }
    HintAt(value.text);
    const std::vector<std::string> alternatives = Alternatives(value.text);
    if (alternatives.size() == 1) return words();
    QueryNode either(QueryNode::Type::kOr);
    for (const std::string& word : alternatives) either.children.emplace_back(QueryNode::Type::kText).text = word;
    Require(either);
    return either;
  }

  void HintAt(const std::string& word) {
    const size_t end = cursor_.Position();
    const std::string hint = HintAtColon(word, cursor_.AtEnd());
    cursor_.MoveTo(end);
    if (!hint.empty()) conditions_.Hint(hint);
  }

  QueryNode ParseField(const FieldStart& field) {
    const size_t begin = cursor_.Position();
    said_ += "| ";
    try {
      if (std::optional<QueryNode> range = ParseRangeOfWords(field)) return std::move(*range);
      cursor_.MoveTo(field.value);
      ConditionValue value = ReadValue();
      AddListed(field.name, value);
      if (value.text.empty()) {
        conditions_.Refuse(begin, "\"" + field.name + ":\" needs a value behind it, as in " + field.name + ":x");
      }
      value.text.insert(0, field.sign);
      value.certain = field.certain;
      return conditions_.Field(field.name, begin, value);
    } catch (const Error&) {
      if (field.certain && !(cursor_.IsPasted() || IsEmptyWithin(field, begin))) throw;
    }
    cursor_.MoveTo(begin);
    return ParseWords();
  }

  /// "name:" without a value, in a query that has more.
  bool IsEmptyWithin(const FieldStart& field, size_t begin) const {
    return field.value == cursor_.Text().size() && !WithoutBlanks(cursor_.Text().substr(0, begin)).empty();
  }

  /// A range is read as far as it makes sense: "date:last 3 weeks", "size: > 10 MB".
  std::optional<QueryNode> ParseRangeOfWords(const FieldStart& field) {
    if (!TakesRange(field.name)) return std::nullopt;
    std::vector<size_t> ends;
    for (size_t end = field.value; ends.size() < kValueWordsMax && cursor_.ExtendValue(end);) ends.push_back(end);
    ConditionValue value;
    value.begin = field.value;
    for (; !ends.empty(); ends.pop_back()) {
      value.text = field.sign + std::string(cursor_.Text().substr(field.value, ends.back() - field.value));
      if (std::optional<QueryNode> node = conditions_.Range(field.name, value)) {
        cursor_.MoveTo(ends.back());
        return node;
      }
    }
    return std::nullopt;
  }

  /// "ext:pdf, odt".
  void AddListed(const std::string& name, ConditionValue& value) {
    const ConditionType type = ConditionTypeOf(name);
    const bool takes_lists = type == ConditionType::kKind || type == ConditionType::kExt;
    while (takes_lists && !value.phrase && value.text.ends_with(',') && !cursor_.AtEnd()) {
      const size_t before = cursor_.Position();
      const ConditionValue next = cursor_.ReadValue();
      const bool fits = type == ConditionType::kKind ? conditions_.IsKind(next.text) : !FieldAt(cursor_.Text(), before);
      if (!fits || next.text.empty()) return cursor_.MoveTo(before);
      value.text += next.text;
    }
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

  QueryCursor cursor_;
  const ConditionReader conditions_;
  std::string said_;           ///< the plain words, each with a blank behind it, and "|" in the place of all else
  size_t depth_ = 0;           ///< of the parentheses and NOTs that are open
  size_t terms_ = 0;           ///< conditions so far, apart from plain words
  bool asks_ = false;          ///< there was a word or a condition
  bool has_and_ = false;       ///< "AND" was written
  bool was_unclosed_ = false;  ///< what was read last is a group without ")"
};

}  // namespace

QueryNode ParseQuery(std::string_view text, int64_t now, std::vector<std::string>* hints) {
  const QueryText read = ReadQueryText(text);
  return Parser(read, now, hints).Parse();
}

}  // namespace ferrox::engine
