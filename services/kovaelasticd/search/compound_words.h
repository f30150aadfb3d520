#pragma once

#include <cstdint>
#include <string>
#include <string_view>
#include <vector>

#include "services/kovaelasticd/store/doc_set.h"
#include "services/kovaelasticd/store/sqlite_db.h"
#include "services/kovaelasticd/store/word_list.h"

namespace ferrox::engine {

/// Languages that write compounds as one word: German, Dutch, the Nordic ones
/// and Finnish.

/// A longer word that a word is a part of, "kundigungsfrist" of "kundigung";
/// and what else it may be made of: "frist", and forms of that.
struct Compound {
  std::string word;
  std::vector<std::string> others;
};

/// Words of the list that begin or end with the folded `word`, and are
/// otherwise a letter or two that join, and another word of the list or what is
/// left of one without its ending; the shortest first. None when there are too
/// many, and for words of fewer than four letters.
std::vector<Compound> CompoundsIn(const WordList& words, std::string_view word);

/// How many of the documents are in one of those languages.
int64_t CountCompounding(Database& database, const DocSet& documents);

}  // namespace ferrox::engine
