#pragma once

#include <string>
#include <string_view>
#include <vector>

#include "services/kovaelasticd/text/stems.h"

namespace ferrox::engine {

/// A word that a snippet shows marked.
struct SnippetWord {
  std::string word;  ///< folded
  bool prefix = false;
  double weight = 1;  ///< how much it counts to show it: more for rarer words
};

/// What a snippet is made for.
struct SnippetOf {
  Language language = Language::kNone;  ///< the document's: words with the stem of a word are marked, too
  std::string_view title;               ///< shown apart: the place where the text has it is second choice
};

/// The part of `text` where most of the words stand, and closest together, about 240 bytes, with each marked; two
/// shorter parts where one has not all words. Control characters become blanks, bytes that are no UTF-8 the replacement
/// character. "" when none of the words is found. Reads at most 256 KiB, and 64 KiB behind the first word found. The
/// marks are put around each word as they are; overlapping pairs of characters are marked as one.
std::string MakeSnippet(std::string_view text, const std::vector<SnippetWord>& words, const std::string& mark_start,
                        const std::string& mark_end, const SnippetOf& of = {});

}  // namespace ferrox::engine
