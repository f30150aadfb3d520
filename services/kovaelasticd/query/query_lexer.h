#pragma once

#include <cstddef>
#include <string>
#include <string_view>

#include "services/kovaelasticd/query/query_conditions.h"

namespace ferrox::engine {

inline bool IsQueryBlank(char c) { return c == ' ' || (c >= '\t' && c <= '\r'); }

/// Reads the value at `pos`, and leaves `pos` behind it: a phrase in quotes, or all up to a blank, a quote or a
/// parenthesis. Parentheses within a word, as in "f(x)" and "report(1).pdf", are part of it, and so are a ")" while no
/// group is open (`in_group`), a quote behind which there is no other, and one that means inches. An opening quote
/// without another is passed over (ConditionValue::unclosed).
ConditionValue ReadQueryValue(std::string_view query, size_t& pos, bool in_group);

/// All up to a blank, of a text in which signs mean nothing.
ConditionValue ReadPastedWord(std::string_view query, size_t& pos);

}  // namespace ferrox::engine
