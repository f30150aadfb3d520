#pragma once

#include <string>
#include <string_view>
#include <vector>

namespace ferrox::engine {

/// A word that a snippet shows marked.
struct SnippetWord {
  std::string word;  ///< folded
  bool prefix = false;
};

/// The part of `text` where the words stand closest together, about 240 bytes, with each marked. Control characters
/// become blanks, bytes that are no UTF-8 the replacement character. "" when none of the words is found. Reads at most
/// 256 KiB, and 64 KiB behind the first word found. The marks are put around each word as they are; overlapping pairs
/// of characters are marked as one.
std::string MakeSnippet(std::string_view text, const std::vector<SnippetWord>& words, const std::string& mark_start,
                        const std::string& mark_end);

}  // namespace ferrox::engine
