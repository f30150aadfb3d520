#pragma once

#include <cstddef>
#include <string_view>
#include <vector>

#include "services/kovaelasticd/query/query.h"

namespace ferrox::engine {

/// Follows the words of a query that stand side by side, and notes of neighbouring ones with digits that they may be
/// one number or code, written in groups: "DE89 3704 0044", "+49 (89) 1234" (QueryNode::joined). A "+" before such
/// digits is part of the number, and parentheses around one of its groups are, too: neither makes them required. A "+"
/// within the run begins another one. Punctuation between words does not part them.
class NumberRun {
 public:
  /// `query` must outlive this.
  explicit NumberRun(std::string_view query) : query_(query) {}

  /// Takes note of the last of `siblings`, which stands in the query from `begin` to before `end`.
  void Add(std::vector<QueryNode>& siblings, size_t begin, size_t end);
  /// What comes next does not stand beside what came before.
  void End() { words_ = 0; }

 private:
  const std::string_view query_;
  size_t words_ = 0;  ///< in the run; they are the last ones of the siblings
  size_t begin_ = 0;  ///< of the first of them in the query
};

}  // namespace ferrox::engine
