#pragma once

#include <chrono>
#include <optional>
#include <string>
#include <utility>
#include <vector>

/// The administrator's list of synonyms, which the search engine may not read itself: it asks `kova-access`
/// (docs/formats/access.md).
namespace ferrox::wire {

/// Words or short phrases, and what a search for one of the former also looks for.
using SynonymRule = std::pair<std::vector<std::string>, std::vector<std::string>>;

struct SynonymAnswer {
  std::string stamp = {};                              ///< of the list
  std::optional<std::vector<SynonymRule>> rules = {};  ///< nothing where the stamp is the one that is known
};

/// `known`: the stamp of the list that the caller has. Blocks at most `longest` for each wait, of which there are few.
/// Nothing when it cannot be told.
std::optional<SynonymAnswer> AskSynonyms(const std::string& known, std::chrono::milliseconds longest);

}  // namespace ferrox::wire
