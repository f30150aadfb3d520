#pragma once

#include <string>
#include <vector>

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

/// Words of texts that match.
struct WordsLike {
  static constexpr size_t kMost = 500;
  std::vector<std::string> words;  ///< the shortest first; at most kMost
  bool has_more = false;
  bool is_known = true;  ///< false: the words of the index are not, so there are none here
};
/// Words that visible documents have, if the pattern is one of words: of letters alone, four of them at least, with
/// three that are given. @throws Error kEngineStorage.
WordsLike FindWordsLike(StoreReader& reader, const Visible& visible, const Pattern& pattern);
bool CanBeWord(const Pattern& pattern);

}  // namespace ferrox::engine
