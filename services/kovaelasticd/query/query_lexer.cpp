#include "services/kovaelasticd/query/query_lexer.h"

namespace ferrox::engine {

namespace {

/// Whether the quote at `at` ends a measure in inches: 5" x 3".
bool MeansInches(std::string_view query, size_t at) {
  const bool ends = at + 1 == query.size() || IsQueryBlank(query[at + 1]);
  return ends && at > 0 && query[at - 1] >= '0' && query[at - 1] <= '9';
}

/// Where a word without quotes ends.
size_t EndOfWord(std::string_view query, size_t begin, bool in_group) {
  size_t end = begin;
  while (end < query.size() && !IsQueryBlank(query[end])) {
    const char c = query[end];
    if (c == '"' && !MeansInches(query, end) && query.find('"', end + 1) != std::string_view::npos) break;
    if (c == ')' && in_group) break;
    if (c == '(') {
      const size_t close = query.find_first_of(" \t\n\v\f\r\"()", end + 1);
      if (close == std::string_view::npos || query[close] != ')') break;
      end = close;
    }
    ++end;
  }
  return end;
}

}  // namespace

ConditionValue ReadQueryValue(std::string_view query, size_t& pos, bool in_group) {
  ConditionValue value;
  value.begin = pos;
  if (pos < query.size() && query[pos] == '"') {
    const size_t close = query.find('"', pos + 1);
    if (close != std::string_view::npos) {
      value.text = query.substr(pos + 1, close - pos - 1);
      value.phrase = true;
      pos = close + 1;
      value.prefix = pos < query.size() && query[pos] == '*';
      if (value.prefix) ++pos;
      return value;
    }
    value.unclosed = true;
    ++pos;
  }
  const size_t end = EndOfWord(query, pos, in_group);
  value.text = query.substr(pos, end - pos);
  pos = end;
  while (value.text.size() > 1 && value.text.back() == '*') {
    value.text.pop_back();
    value.prefix = true;
  }
  return value;
}

ConditionValue ReadPastedWord(std::string_view query, size_t& pos) {
  ConditionValue value;
  value.begin = pos;
  while (pos < query.size() && !IsQueryBlank(query[pos])) value.text += query[pos++];
  return value;
}

}  // namespace ferrox::engine
