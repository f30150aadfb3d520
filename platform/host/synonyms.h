#pragma once

#include <memory>
#include <string>
#include <string_view>
#include <utility>
#include <vector>

/// The administrator's list of words that mean the same, "/etc/kova/synonyms.conf" below the instance's root:
///   # a comment
///   car, automobile, auto        # each finds the others
///   tv => television, telly      # "tv" finds those, but not the other way round
namespace kova::host {

/// Words or short phrases as they are written, and what a search for one of the former also looks for.
using SynonymRule = std::pair<std::vector<std::string>, std::vector<std::string>>;

constexpr size_t kSynonymsMaxBytes = 64U << 10;
constexpr size_t kSynonymsMaxLines = 1000;

struct SynonymList {
  std::string stamp = {};  ///< of the file; "" without one
  std::vector<SynonymRule> rules = {};
  std::vector<std::string> problems = {};  ///< of the lines that do not count, for people: "line 3 ..."
};

/// What the lines of the file say. A line that cannot be used is a problem, and leaves the others as they are.
SynonymList ReadSynonyms(std::string_view text);

/// Where the file of this instance is.
std::string SynonymsPath();

/// The present list, re-read when its file has changed; empty without the file. Any thread may call.
std::shared_ptr<const SynonymList> GetSynonyms();

}  // namespace kova::host
