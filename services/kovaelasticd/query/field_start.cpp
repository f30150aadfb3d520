#include "services/kovaelasticd/query/field_start.h"

#include "base/text.h"
#include "services/kovaelasticd/query/field_names.h"
#include "services/kovaelasticd/query/query_lexer.h"
#include "services/kovaelasticd/query/query_values.h"

namespace ferrox::engine {

namespace {

bool IsNameChar(char c) {
  const char lower = base::LowerAscii(c);
  return (lower >= 'a' && lower <= 'z') || (c >= '0' && c <= '9') || c == '_';
}

bool IsCapital(char c) { return c >= 'A' && c <= 'Z'; }

size_t SkipBlanksFrom(std::string_view query, size_t at) {
  while (at < query.size() && IsQueryBlank(query[at])) ++at;
  return at;
}

/// "size>1M": a field with a range, whose value begins at `at` with a sign.
std::optional<FieldStart> ComparedField(std::string_view query, std::string name, size_t at) {
  const bool has_sign = at < query.size() && (query[at] == '<' || query[at] == '>');
  const ConditionType type = ConditionTypeOf(name);
  const bool has_range =
      type == ConditionType::kSize || type == ConditionType::kDate || FindRangeField(name) != nullptr;
  if (!has_sign || !has_range) return std::nullopt;
  const size_t behind = at + (query.substr(at + 1, 1) == "=" ? 2 : 1);
  return FieldStart{std::move(name), SkipBlanksFrom(query, behind), std::string(query.substr(at, behind - at)), false};
}

}  // namespace

std::optional<FieldStart> FieldAt(std::string_view query, size_t begin) {
  size_t end = begin;
  while (end < query.size() && IsNameChar(query[end])) ++end;
  std::string name(query.substr(begin, end - begin));
  if (end == query.size() || !IsFieldName(name)) return std::nullopt;
  if (query[end] != ':') return ComparedField(query, std::move(name), SkipBlanksFrom(query, end));
  const size_t value = end + 1;
  if (query.substr(value, 1) == ":") return std::nullopt;
  const bool apart = value == query.size() || IsQueryBlank(query[value]);
  if (!apart) return FieldStart{std::move(name), value, "", true};
  if (IsCapital(name.front()) || query.find('\n') != std::string_view::npos) return std::nullopt;
  const size_t next = SkipBlanksFrom(query, value);
  return FieldStart{std::move(name), next, "", next == query.size()};
}

}  // namespace ferrox::engine
