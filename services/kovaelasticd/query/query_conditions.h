#pragma once

#include <cstdint>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "services/kovaelasticd/query/query.h"
#include "services/kovaelasticd/query/query_values.h"

namespace ferrox::engine {

/// A value as the query has it: a word, or a phrase without its quotes.
struct ConditionValue {
  std::string text;
  bool phrase = false;    ///< it stood in quotes
  bool prefix = false;    ///< a "*" stood behind it, which `text` is without
  size_t begin = 0;       ///< its place in the query, in bytes
  bool unclosed = false;  ///< a quote before it was passed over
  bool certain = true;    ///< false: it is text, unless it fits well
};

/// Turns single conditions of a query, a word or "field:value", into nodes: knows the names of fields, the kinds of
/// values that each takes, and what to write instead of what it cannot read.
class ConditionReader {
 public:
  /// `query` is the whole query; it must outlive this. `now`: what relative dates count from, in seconds since the
  /// epoch. `hints` gets sentences about what was read otherwise than it may be meant; null: none.
  ConditionReader(std::string_view query, int64_t now, std::vector<std::string>* hints)
      : query_(query), now_(now), hints_(hints) {}

  /// Words anywhere (kText), for which "*.pdf" is an extension and "a|b" either, or in the name (kName); kAll when the
  /// value has neither letter nor digit. Of a URL, without its "https://".
  /// @throws Error kEngineBadRequest, as Field does.
  QueryNode Words(QueryNode::Type type, const ConditionValue& value, bool is_pasted = false) const;
  /// The condition "name:value", which begins at `begin`; the value is not empty.
  QueryNode Field(const std::string& name, size_t begin, const ConditionValue& value) const;
  /// Field for a name with TakesRange; nothing where the value does not fit.
  std::optional<QueryNode> Range(const std::string& name, const ConditionValue& value) const;
  static bool IsKind(const std::string& word);
  /// Throws Error kEngineBadRequest: "query, character N: sentence"; N is the place of the byte `at`, counted in
  /// characters from 1.
  [[noreturn]] void Refuse(size_t at, const std::string& sentence) const;
  /// Each sentence once.
  void Hint(const std::string& sentence) const;

 private:
  ConditionValue WithoutWildcards(QueryNode::Type type, ConditionValue value) const;
  QueryNode Type(const std::string& name, size_t begin, const ConditionValue& value) const;
  QueryNode Has(const ConditionValue& value) const;
  QueryNode WordsInField(const std::string& name, size_t begin, const ConditionValue& value) const;
  std::string UserNumber(const ConditionValue& value) const;
  std::string GroupNumber(const ConditionValue& value) const;
  QueryNode Kinds(const ConditionValue& value) const;
  QueryNode Extensions(const ConditionValue& value) const;
  QueryNode Path(const ConditionValue& value) const;
  [[noreturn]] void RefuseRange(const std::string& name, const ConditionValue& value) const;
  std::vector<std::string> Parts(const ConditionValue& value) const;

  const std::string_view query_;
  const int64_t now_;
  std::vector<std::string>* const hints_;
};

}  // namespace ferrox::engine
