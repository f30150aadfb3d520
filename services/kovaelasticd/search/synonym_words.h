#pragma once

#include <cstddef>
#include <string>
#include <vector>

#include "services/kovaelasticd/query/synonyms.h"

namespace ferrox::engine {

/// Something else that a word of a query finds, too.
struct SynonymOfWord {
  size_t of;         ///< position of the word in the list that was given
  std::string from;  ///< the word, or the phrase that it stands in; folded, as what follows
  std::string shown;
  Synonyms::Words words;
};

/// The synonyms of the words of a query, which are folded, "" for what is no single word; and of neighbours that are a
/// phrase of the list, for each of its words. No word has more than 16, and none twice.
std::vector<SynonymOfWord> SynonymsIn(const std::vector<std::string>& words, const Synonyms& synonyms);

}  // namespace ferrox::engine
