#pragma once

#include <string>
#include <vector>

namespace ferrox::engine {

/// Which of a query's folded words only hold its sentence together: of "how do I list open files" the first three. A
/// word may be such a one in one language and something else in another, so these are the words of one language alone,
/// that which the query has most of, and two at least. Never all words of a query.
std::vector<bool> FindFunctionWords(const std::vector<std::string>& words);

}  // namespace ferrox::engine
