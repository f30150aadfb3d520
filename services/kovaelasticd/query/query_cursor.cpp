#include "services/kovaelasticd/query/query_cursor.h"

#include <algorithm>
#include <iterator>

#include "services/kovaelasticd/query/field_start.h"
#include "services/kovaelasticd/query/query_lexer.h"

namespace ferrox::engine {

namespace {

/// Further ones are looked at later: each look ahead is short.
constexpr int kOrsInRow = 4;

}  // namespace

void QueryCursor::SkipBlanks() {
  while (pos_ < text_.size() && IsQueryBlank(text_[pos_])) ++pos_;
}

bool QueryCursor::AtEnd() {
  SkipBlanks();
  return pos_ >= text_.size() || (text_[pos_] == ')' && groups_ > 0);
}

/// Takes the word at hand when it is `word` and ends there.
bool QueryCursor::TakeWord(std::string_view word) {
  if (text_.substr(pos_, word.size()) != word) return false;
  const size_t end = pos_ + word.size();
  if (end < text_.size() && !IsQueryBlank(text_[end]) && text_[end] != '(') return false;
  pos_ = end;
  return true;
}

/// The same where something is behind it; else it is left.
bool QueryCursor::TakeOperator(std::string_view word) {
  const size_t begin = pos_;
  if (TakeWord(word) && !AtEnd()) return true;
  pos_ = begin;
  return false;
}

bool QueryCursor::TakeOr() {
  SkipBlanks();
  const bool bar = !is_pasted_ && (TakeWord("||") || TakeWord("|"));
  return bar || (has_operators_ && (TakeWord("OR") || TakeWord("or")));
}

bool QueryCursor::IsOrAhead(bool has_before, bool text_before) {
  const size_t begin = pos_;
  const bool is_small = has_operators_ && TakeWord("or");
  pos_ = begin;
  bool any = false;
  for (int more = kOrsInRow; more > 0 && TakeOr(); --more) any = true;
  const bool has_behind = any && !AtEnd();
  const bool by_condition = !text_before || (has_behind && (text_[pos_] == '(' || FieldAt(text_, pos_).has_value()));
  pos_ = begin;
  return has_before && has_behind && (!is_small || groups_ > 0 || by_condition);
}

bool QueryCursor::TakeAnd() { return has_operators_ && TakeOperator("AND"); }

/// Whether `sign` is at hand, and before something: signs alone, such as "-" and "--", are words without letters.
bool QueryCursor::HasSign(char sign) const {
  if (is_pasted_ || text_[pos_] != sign) return false;
  const size_t behind = text_.find_first_not_of("+-", pos_);
  return behind != std::string_view::npos && !IsQueryBlank(text_[behind]) && text_[behind] != ')';
}

bool QueryCursor::TakeNot() {
  if (HasSign('-') && text_[pos_ + 1] != '-') {
    ++pos_;
    return true;
  }
  return has_operators_ && (TakeOperator("NOT") || (groups_ > 0 && TakeOperator("not")));
}

bool QueryCursor::TakePlus() {
  if (!HasSign('+')) return false;
  pos_ = text_.find_first_not_of('+', pos_);
  return true;
}

/// Of "(final).docx" the parentheses are part of a name.
bool QueryCursor::OpenGroup() {
  if (is_pasted_ || text_[pos_] != '(') return false;
  const size_t close = text_.find_first_of(" \t\n\v\f\r\"()", pos_ + 1);
  const bool is_word = close != std::string_view::npos && text_[close] == ')' && close > pos_ + 1 &&
                       close + 1 < text_.size() && !IsQueryBlank(text_[close + 1]) &&
                       std::string_view("()\"*").find(text_[close + 1]) == std::string_view::npos;
  if (is_word) return false;
  ++pos_;
  ++groups_;
  return true;
}

bool QueryCursor::CloseGroup() {
  --groups_;
  if (pos_ >= text_.size()) return false;
  ++pos_;
  return true;
}

ConditionValue QueryCursor::ReadValue() {
  SkipBlanks();
  return is_pasted_ ? ReadPastedWord(text_, pos_) : ReadQueryValue(text_, pos_, groups_ > 0);
}

bool QueryCursor::ExtendValue(size_t& end) const {
  const size_t begin = std::min(text_.size(), text_.find_first_not_of(' ', end));
  const size_t behind = std::min(text_.size(), text_.find_first_of(" \t\n\v\f\r\"()", begin));
  if (behind == begin) return false;
  end = behind;
  return true;
}

bool QueryCursor::HasCapitalOperators() const {
  if (is_pasted_ || has_operators_) return false;
  constexpr std::string_view kOperators[] = {" AND ", " OR ", " NOT "};
  return std::any_of(std::begin(kOperators), std::end(kOperators),
                     [this](std::string_view word) { return text_.find(word) != std::string_view::npos; });
}

}  // namespace ferrox::engine
