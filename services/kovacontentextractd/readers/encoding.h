#pragma once

#include <string>
#include <string_view>

/// From the bytes of a text file to UTF-8.
namespace ferrox::extract {

struct DecodedText {
  std::string text;      ///< valid UTF-8, without a byte order mark
  std::string encoding;  ///< its name, for example "UTF-8"; " (guess)" follows where the bytes tell too little
};

/// Decodes the first bytes of a file (`cut`: there are more). `declared` is what the content says of its encoding, as
/// HTML and XML can; it counts when the bytes are not UTF-8. In order: a byte order mark, UTF-8, UTF-16 without a mark,
/// ISO-2022-JP by its escapes, the declared encoding, detection by statistics.
/// @return false when the bytes are no text.
bool Decode(std::string_view bytes, bool cut, const std::string& declared, DecodedText& decoded);

}  // namespace ferrox::extract
