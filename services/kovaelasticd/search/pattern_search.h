#pragma once

#include <string>

#include "services/kovaelasticd/search/ranked_word.h"
#include "services/kovaelasticd/search/term_hits.h"
#include "services/kovaelasticd/store/doc_set.h"
#include "services/kovaelasticd/store/store_reader.h"
#include "services/kovaelasticd/store/visible.h"
#include "services/kovaelasticd/text/pattern.h"

namespace ferrox::engine {

// What finds patterns with "*" and "?". Both cost at most a pass over all names, or over all words of the index; for an
// ordinary user that ends with the time of the request (WorkLimit). What comes out is decided by visible documents.

/// The visible documents whose names match. Three characters of the pattern that stand together bound the work to names
/// that have them. @throws Error kEngineStorage.
DocSet DocumentsNamedLike(StoreReader& reader, const Visible& visible, const Pattern& pattern);

/// A pattern, and as it stands in the query.
struct TypedPattern {
  const Pattern& pattern;
  const std::string& text;
  bool is_marked;  ///< in snippets
};
/// Finds the words of texts and titles that match, in visible documents; these come into `found`, and what snippets
/// mark and hints tell of it into `words`. The pattern must be one of words: of letters alone, three of them given. It
/// stands for the shortest 500 at most. @throws Error kEngineStorage.
void CollectWordsLike(StoreReader& reader, const Visible& visible, const TypedPattern& typed, TermCollector& found,
                      FoundWords& words);

}  // namespace ferrox::engine
