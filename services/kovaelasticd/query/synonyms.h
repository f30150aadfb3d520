#pragma once

#include <cstddef>
#include <map>
#include <string>
#include <utility>
#include <vector>

namespace ferrox::engine {

/// Words that the administrator says mean the same. A word of a query also finds what its synonyms find.
class Synonyms {
 public:
  using Words = std::vector<std::string>;
  /// Words or short phrases, as they are written, and what a search for one of the former also looks for.
  using Rule = std::pair<Words, Words>;

  Synonyms() = default;
  explicit Synonyms(const std::vector<Rule>& rules);

  bool IsEmpty() const { return others_.empty(); }
  /// A longer phrase in a query is not looked up.
  static constexpr size_t kPhraseMax = 4;
  /// What is looked for beside these neighbouring words of a query, folded: each a word or several as a phrase, at most
  /// kOthersMax.
  const std::vector<Words>& Of(const Words& words) const;

 private:
  static constexpr size_t kOthersMax = 16;

  std::map<Words, std::vector<Words>> others_;
};

}  // namespace ferrox::engine
