#pragma once

#include <string>
#include <string_view>

namespace ferrox::engine {

/// A query as it is read.
struct QueryText {
  /// As it was typed, character by character, but with one form of what keyboards and programs write differently:
  /// quotes (“x”, „x“, «x»), letters and signs of full width, blanks, and minus signs before words.
  std::string text;
  bool is_cut = false;        ///< it was longer than kQueryMaxBytes, and was cut behind a word
  bool is_pasted = false;     ///< it has several lines, so it is text, in which signs and parentheses mean nothing
  bool all_capitals = false;  ///< it has no small letter, so "AND" is a word
};

QueryText ReadQueryText(std::string_view typed);

/// The folder or file, as people see it ("/photo/2024 b"), that a whole query names by the address that a file manager
/// shows: "\\server\photo\2024 b", "smb://server/photo/2024%20b", "file:///photo". "" for any other query.
std::string PlaceOfAddress(std::string_view query);

}  // namespace ferrox::engine
