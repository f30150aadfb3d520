#include "services/kovaelasticd/query/field_start.h"

#include <utility>

#include "base/text.h"
#include "services/kovaelasticd/query/field_names.h"
#include "services/kovaelasticd/query/query_lexer.h"

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

/// Whether few texts can stand behind the name: what fits is hardly meant as text.
bool TakesFewValues(std::string_view name) {
  const ConditionType type = ConditionTypeOf(name);
  return TakesRange(name) || type == ConditionType::kKind;
}

/// "size>1M", "size=1M": a field with a range, whose value begins at `at` with a sign.
std::optional<FieldStart> ComparedField(std::string_view query, std::string name, size_t at) {
  if (at == query.size() || !TakesRange(name)) return std::nullopt;
  const bool is_equal = query[at] == '=';
  if (!is_equal && query[at] != '<' && query[at] != '>') return std::nullopt;
  const size_t behind = at + (!is_equal && query.substr(at + 1, 1) == "=" ? 2 : 1);
  std::string sign(is_equal ? "" : query.substr(at, behind - at));
  return FieldStart{std::move(name), SkipBlanksFrom(query, behind), std::move(sign), false};
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
  const bool is_first = SkipBlanksFrom(query, 0) == begin;
  if (IsCapital(name.front()) && !(is_first && TakesFewValues(name))) return std::nullopt;
  if (query.find('\n') != std::string_view::npos) return std::nullopt;
  const size_t next = SkipBlanksFrom(query, value);
  return FieldStart{std::move(name), next, "", is_first && next == query.size()};
}

}  // namespace ferrox::engine
