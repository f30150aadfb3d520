#pragma once

#include <string>
#include <vector>

#include "services/kovaelasticd/query/query.h"
#include "services/kovaelasticd/search/ranking_constants.h"

namespace ferrox::engine {

/// One way in which a word of a query may stand in documents.
struct WordForm {
  enum class Kind { kExact, kStem, kOther };
  Kind kind = Kind::kExact;
  std::string content;  ///< expression for content_fts; "": it is not looked for there
  std::string meta;     ///< for meta_fts; "" likewise
  bool prefix = false;  ///< these look for the beginning of a word
  double share = 1;     ///< of what the word itself is worth
};

/// The word of a condition that is one; "" for what is several, or the beginning of one.
std::string SingleWord(const QueryNode& node);

/// How a condition of type kText, kField or kName is looked for: as it is written first. `widely`: as stems and in
/// other spellings too, which is for plain words that documents are ranked by.
std::vector<WordForm> FormsOf(const QueryNode& node, bool widely, const RankingConstants& constants);

/// The single words under which documents may have a number or code that several words of a query are together.
std::vector<WordForm> CodeForms(const std::string& text, const RankingConstants& constants);
/// The same for other spellings of a folded word (OtherSpellings).
std::vector<WordForm> SpellingForms(const std::string& word, const RankingConstants& constants);

/// The forms of a word that is looked for in place of another one.
std::vector<WordForm> FormsOf(const std::string& word, const RankingConstants& constants);

/// Any of these words, as they are.
WordForm FormOfAny(const std::vector<std::string>& words);

/// The forms of a word, or of a phrase, whose words are looked for as they are.
std::vector<WordForm> FormsOf(const std::vector<std::string>& words, const RankingConstants& constants);

/// The expressions that find these forms in texts, but for beginnings of words.
std::vector<std::string> PhrasesOf(const std::vector<WordForm>& forms);

/// The expression that looks for the text within names, by its groups of three characters; "" for fewer.
std::string NamePartExpression(const std::string& text);

}  // namespace ferrox::engine
