#pragma once

#include <cstddef>
#include <string_view>

#include "services/kovaelasticd/query/query_conditions.h"
#include "services/kovaelasticd/query/query_text.h"

namespace ferrox::engine {

/// The place in a query that is to be read next, and the signs and words there that join conditions.
class QueryCursor {
 public:
  /// `text` must outlive this.
  explicit QueryCursor(const QueryText& text)
      : text_(text.text), is_pasted_(text.is_pasted), has_operators_(!text.is_pasted && !text.all_capitals) {}

  std::string_view Text() const { return text_; }
  size_t Position() const { return pos_; }
  void MoveTo(size_t position) { pos_ = position; }
  bool IsPasted() const { return is_pasted_; }
  /// Whether there is an AND, OR or NOT which is a word, since all is in capitals.
  bool HasCapitalOperators() const;

  /// Passes over blanks. Whether the query ends here, or the group that is open.
  bool AtEnd();
  /// Whether "OR" or "|" comes next, and something behind it; `has_before`: and before it. A small "or" is one within
  /// parentheses and beside conditions; `text_before` tells that what stands before it is none.
  bool IsOrAhead(bool has_before, bool text_before);
  /// Takes what IsOrAhead means.
  bool TakeOr();
  /// Takes "AND" where something is behind it.
  bool TakeAnd();
  /// Takes "NOT" or "-" likewise; within parentheses also "not". "--x" is a word.
  bool TakeNot();
  /// Takes "+", or several.
  bool TakePlus();
  /// Takes a "(".
  bool OpenGroup();
  /// Ends the group that was opened last. @return whether there is a ")", which is taken.
  bool CloseGroup();
  ConditionValue ReadValue();
  /// Moves `end`, within a value of several words, behind the next of them. False where there is none.
  bool ExtendValue(size_t& end) const;

 private:
  void SkipBlanks();
  bool TakeWord(std::string_view word);
  bool TakeOperator(std::string_view word);
  bool HasSign(char sign) const;

  const std::string_view text_;
  const bool is_pasted_;
  const bool has_operators_;
  size_t pos_ = 0;
  size_t groups_ = 0;  ///< parentheses that are open
};

}  // namespace ferrox::engine
