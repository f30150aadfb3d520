#pragma once

#include <set>
#include <string>
#include <string_view>
#include <vector>

namespace base {

/// Patterns of names of files and folders, as shares have them: "*" stands for any characters, "?" for one; a whole
/// name has to match. A byte that is no UTF-8 is a character of its own. Never changes, so any thread may use it.
class NameRules {
 public:
  /// The text that stands for patterns without an order: "" for none, else "=" where upper and lower case count, then
  /// each pattern behind a "/". Equal patterns have equal texts. They must not be empty or hold a "/".
  static std::string TextOf(const std::vector<std::string>& patterns, bool case_counts);

  /// `text` is one of TextOf.
  explicit NameRules(std::string_view text);
  bool IsEmpty() const { return whole_.empty() && wild_.empty(); }
  /// For each pattern with a "*" at most as many steps as pattern and name are long, multiplied.
  bool Match(std::string_view name) const;
  /// Whether one of the names in `path`, below a folder and without "/" at its beginning, matches.
  bool MatchAnyIn(std::string_view path) const;

 private:
  const bool case_counts_;
  std::set<std::string, std::less<>> whole_;  ///< without "*" and "?"
  std::vector<std::string> wild_;
};

}  // namespace base
