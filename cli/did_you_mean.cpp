#include "cli/did_you_mean.h"

#include <algorithm>
#include <utility>

#include "base/edit_distance.h"
#include "base/text.h"
#include "cli/command.h"
#include "cli/escape.h"

namespace ferrox::cli {

namespace {

constexpr size_t kShownMax = 3;

/// Of names of up to three letters one may differ, of longer ones more.
size_t LettersMax(size_t length) { return length < 4 ? 1 : length < 8 ? 2 : 3; }

bool IsWordOf(const std::string& typed, const std::string& candidate) {
  const std::vector<std::string> words = Split(candidate, ' ');
  return words.size() > 1 && std::find(words.begin(), words.end(), typed) != words.end();
}

}  // namespace

std::vector<std::string> Alike(const std::string& typed, const std::vector<std::string>& candidates) {
  constexpr size_t kLongestTyped = 256;
  if (typed.size() < 2 || typed.size() > kLongestTyped) return {};
  const std::string lower = base::LowerAscii(typed);
  const size_t most = LettersMax(lower.size());
  base::EditDistance distances(lower, most);
  std::vector<std::pair<size_t, std::string>> near;
  for (const std::string& candidate : candidates) {
    const std::string other = base::LowerAscii(candidate);
    size_t distance = distances.DistanceOf(other);
    if (other.compare(0, lower.size(), lower) == 0 || IsWordOf(lower, other)) distance = std::min<size_t>(distance, 1);
    // A name of which every letter differs is another name, however short.
    if (distance <= most && distance < other.size()) near.emplace_back(distance, candidate);
  }
  std::sort(near.begin(), near.end());
  near.erase(std::unique(near.begin(), near.end()), near.end());
  std::vector<std::string> alike;
  for (const auto& [distance, candidate] : near) {
    if (alike.size() < kShownMax && distance == near[0].first) alike.push_back(candidate);
  }
  return alike;
}

std::string DidYouMean(const std::string& typed, const std::vector<std::string>& candidates) {
  std::string list;
  for (const std::string& name : Alike(typed, candidates))
    list += (list.empty() ? "" : " or ") + EscapeForTerminal(name);
  return list.empty() ? "" : ". Did you mean: " + list + "?";
}

}  // namespace ferrox::cli
