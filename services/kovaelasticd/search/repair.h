#pragma once

#include <cstdint>
#include <string>
#include <vector>

#include "services/kovaelasticd/store/store_reader.h"
#include "services/kovaelasticd/store/visible.h"

namespace ferrox::engine {

/// A folded word of a query, and in how many visible documents it was found.
struct RareWord {
  std::string word;
  int64_t documents = 0;
};

/// Another spelling of a word.
struct Repair {
  size_t of = 0;  ///< position of the word in the list that was given
  std::string word;
  double likelihood = 1;  ///< below 1; the less alike, the lower
};

/// Words of visible documents that were probably meant by rare ones: in the order of the words, the best first, at most
/// three for each. Words with a digit, and short ones, have none. @throws Error kEngineStorage.
std::vector<Repair> RepairWords(StoreReader& reader, const Visible& visible, const std::vector<RareWord>& words);

}  // namespace ferrox::engine
