#pragma once

#include <string>
#include <string_view>
#include <vector>

namespace ferrox::engine {

// What single words of a query stand for beside themselves.

/// The extensions in "*.pdf" and "*.{jpg,png}", in small letters; none for anything else.
std::vector<std::string> ExtensionsAsked(std::string_view word);

/// The words of "jpg|png"; of anything else the word alone.
std::vector<std::string> Alternatives(std::string_view word);

/// The word as a Pattern, without punctuation at its end, and with "*" for ".*"; "" where it is none.
std::string PatternAsked(std::string_view word);

/// Of a single word with "*" or "?" within it what stands before the first of them; "" for anything else.
std::string_view BeforeWildcard(std::string_view word);

/// How many bytes at the front of a URL tell no document from another: "https://", "mailto:".
size_t SchemeBytes(std::string_view word);

/// What is to be said of a word that was read as text although it has a ":", as "autor:ada" and "Author:"; "" for
/// nothing. `is_last`: nothing follows.
std::string HintAtColon(const std::string& word, bool is_last);

/// Sentences about words that are read as text, although they may be meant as conditions: "bigger than 10 MB", "cats
/// not dogs", "^a.*b$". `words` are parted by single blanks.
std::vector<std::string> HintsAtText(const std::string& words);

}  // namespace ferrox::engine
