#pragma once

#include <bitset>
#include <cstddef>
#include <cstdint>
#include <string>
#include <string_view>
#include <unordered_map>
#include <vector>

#include "base/name_pattern.h"

namespace base {

/// A list of patterns in gitignore's syntax, which choose files and folders below one folder. Of the patterns that
/// match, the last counts; one that begins with "!" takes back what earlier ones chose. What lies in a chosen folder is
/// not asked about: it is chosen with it.
///
/// A pattern without "/" but at its end matches names at any depth; one with a "/" matches paths from the list's folder
/// on. "/" at the end: folders alone. "*" and "?" stand for any bytes, or one byte, of a name; "**" between slashes for
/// any number of folders; "[a-z]", "[!a]", "[[:digit:]]" for one byte. A backslash takes away what the next byte means.
/// "#" begins a comment, blanks at a line's end count only behind a backslash. A pattern that makes no sense (an open
/// "[", a backslash at the end) matches nothing.
///
/// The way down from the list's folder is walked by states, so that each name is matched once and not once for each
/// file below it. To match a name costs at most the bytes of the patterns times those of the name; plain names and
/// "*.ext" together cost two looks into a table. Immutable once made: safe for several threads.
class IgnorePatterns {
 public:
  /// How far the patterns with a "/" have come on the way to a folder.
  struct State {
    /// Of each: the pattern, and the segment that the next name is to match. Ascending, each once.
    std::vector<std::pair<uint32_t, uint32_t>> waiting;
    bool operator==(const State&) const = default;
  };
  static constexpr int kNone = -1;

  IgnorePatterns() = default;
  /// Adds the pattern of one line, without the line's end, behind those that are there; a line without a pattern adds
  /// nothing. `line` is its number, for messages. @return whether it holds a pattern.
  bool Add(std::string_view text, uint32_t line);

  bool Empty() const { return patterns_.empty(); }
  size_t Count() const { return patterns_.size(); }

  /// In the list's folder.
  State Begin() const;
  /// In the folder `name` of the folder at `state`.
  State Enter(const State& state, std::string_view name) const;
  /// The last pattern that matches `name` in the folder at `state`; kNone.
  int Match(const State& state, std::string_view name, bool is_folder) const;

  /// Of a pattern, by its number.
  bool TakesBack(int pattern) const { return patterns_[static_cast<size_t>(pattern)].takes_back; }
  uint32_t LineOf(int pattern) const { return patterns_[static_cast<size_t>(pattern)].line; }
  const std::string& TextOf(int pattern) const { return patterns_[static_cast<size_t>(pattern)].text; }

 private:
  struct Segment {
    NamePattern name;
    bool any_folders = false;  ///< "**"
  };
  struct Pattern {
    std::string text;
    uint32_t line = 0;
    bool takes_back = false;
    bool folders_only = false;
    std::vector<Segment> segments;  ///< more than one, or anchored: matched by states
  };
  /// The last pattern for files and folders, and the last for folders alone.
  struct Last {
    int any = kNone;
    int folder = kNone;
  };
  struct NameHash : std::hash<std::string_view> {
    using is_transparent = void;
  };
  using ByName = std::unordered_map<std::string, Last, NameHash, std::equal_to<>>;

  void AddWaiting(State& state, uint32_t pattern, uint32_t segment) const;
  static void Note(ByName& table, std::string name, int pattern, bool folders_only);
  static int Find(const ByName& table, std::string_view name, bool is_folder);

  std::vector<Pattern> patterns_;
  ByName plain_;       ///< patterns that are names
  ByName extensions_;  ///< "*.ext", by ".ext"
  std::vector<uint32_t> others_;
  // With which bytes the names begin that these can match.
  std::bitset<256> plain_begin_;
  std::bitset<256> others_begin_;
  std::vector<uint32_t> anchored_;
};

}  // namespace base
