#pragma once

#include <cstddef>
#include <cstdint>
#include <string>
#include <string_view>
#include <vector>

#include "services/kovaelasticd/search/term_hits.h"
#include "services/kovaelasticd/store/doc_set.h"
#include "services/kovaelasticd/text/snippet.h"

namespace ferrox::engine {

/// A word or phrase of a query that documents are ranked by, in all its forms, and where it was found.
struct RankedWord {
  std::string word;                       ///< folded, as it is shown
  std::vector<std::string> repairs = {};  ///< what hits that are `repaired` have in its place, the likeliest first
  std::vector<std::string> related = {};  ///< what hits may have in its place that is no repair (TermHit::related)
  size_t synonyms = 0;                    ///< of `related`, the first ones; the others are compounds
  double rarity = 0;                      ///< of all forms together
  size_t letters = 0;                     ///< of `word` (CountLetters): how much it is of a name
  std::vector<TermHit> hits = {};
  DocSet folders = {};  ///< documents below folders that are named so
  double folder_rarity = 0;
  bool own_first = false;                 ///< hits that are `repaired` come behind the others
  std::vector<std::string> phrases = {};  ///< full-text expressions, each for a single word, for nearness
  bool is_function = false;               ///< FindFunctionWords
  int64_t documents = 0;                  ///< how many have it, but for parts of names and for folders
};

/// The words of a query, apart from those behind NOT.
struct FoundWords {
  std::vector<RankedWord> ranked;       ///< in the order of the query, the required ones first
  std::vector<std::string> looked_for;  ///< folded, for other spellings
  std::vector<SnippetWord> marked;      ///< for snippets
  std::vector<std::string> hints = {};  ///< as in SearchReply
};

/// What one of `all` documents has the more, the fewer others have it.
double Rarity(int64_t all, int64_t documents);

/// How many bytes of a text are neither digits nor ASCII punctuation: how much a word is of a name.
size_t CountLetters(std::string_view text);

}  // namespace ferrox::engine
