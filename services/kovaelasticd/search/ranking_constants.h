#pragma once

#include <cstddef>
#include <cstdint>

namespace ferrox::engine {

/// All that decides the order of hits by relevance. A word that is found in a document adds its rarity, times what it
/// is worth where it stands; these are the values. A benchmark may give a Searcher others.
struct RankingConstants {
  // The text, by BM25: occurrences near a limit of 1 + k1 times the rarity, later in longer texts. `b` is how much the
  // length counts, from 0 to 1.
  double k1 = 1.7;
  double b = 0.67;

  // Places beside the text.
  double in_name = 0.3;
  double in_most_of_name = 0.8;  ///< more, times the cube of the share of the name that the words are
  double in_whole_name = 1.5;    ///< more, where they and it are the same
  double in_title = 3.0;
  double in_fields = 0.8;
  double in_name_part = 0.3;  ///< within a word of the name
  double in_folder = 0.5;     ///< the name of a folder above

  /// Of a word that only holds a sentence together (FindFunctionWords), the share that its occurrences in the text
  /// count. In names and titles such a word is as good as any.
  double function_word = 0;

  // Other forms of a word, as a share of what the word itself is worth.
  double stem = 0.6;
  double spelling = 0.9;
  double synonym = 0.8;
  double compound = 0.3;       ///< that the word is a part of; it is worth
  double compound_most = 0.5;  ///< at most so much, so that the word itself comes first

  // A word that a repair goes beside (SearchReply::repaired with `also`): what the word as it was typed adds at least,
  // and what a repaired one adds at most. So the former come first.
  double own_word = 2.2;
  double repaired_most = 2.0;

  // Words that stand close together, in the measure of the rarer one's rarity.
  double near_text = 4.0;
  double near_title = 2.0;
  double near_half = 1.0;       ///< so much nearness (1: right behind each other, once) adds half of what it may
  double near_backwards = 0.6;  ///< the share of words in another order than the query's

  // A query of more words than this, without function words, describes something: the more they are, the less title and
  // nearness count.
  double long_query = 2.5;

  // What bounds the work.
  size_t words_max = 32;               ///< of a query's words the rarest count
  int64_t common_part = 4;             ///< a word in more than one document in so many admits none beside a rarer one,
  int64_t common_scored_max = 200000;  ///< and does not even score when it is in more than so many
  size_t near_words_max = 8;           ///< the rarest are looked at for nearness
  int64_t near_documents_max = 12000;  ///< a word in more documents is not
  size_t near_positions_max = 16;      ///< of a word in a document
};

}  // namespace ferrox::engine
