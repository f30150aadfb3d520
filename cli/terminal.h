#pragma once

#include <cstddef>
#include <string>
#include <string_view>

/// What the terminal that results go to can show, and texts in the shape of its lines.
namespace ferrox::cli {

struct Terminal {
  bool is_there = false;  ///< standard output is a terminal: results take the form for people
  bool styles = false;    ///< bold and colours: not where NO_COLOR or TERM=dumb asks for none
  bool links = false;     ///< it is one that is known to make hyperlinks of OSC 8
  size_t columns = 80;

  /// Of standard output, by the environment and the window's size at this moment.
  static Terminal OfOutput();
};

/// The columns of the terminal behind a descriptor, 80 where it does not say. Asked each time, since windows change.
size_t ColumnsOf(int descriptor);

/// How many columns a text of one line takes; marks of matches (below) take none.
size_t WidthOf(std::string_view text);

/// What stands around a match in a text that is not styled yet. No text that was escaped has them.
inline constexpr char kMatchBegin = '\x02';
inline constexpr char kMatchEnd = '\x03';

/// The text on lines of at most `columns` columns, broken at blanks, each but the first behind `indent` blanks, which
/// also the first line has before it, outside of this text. A word that is wider than a line is broken where it has to
/// be. No line break at the end.
std::string Wrapped(std::string_view text, size_t columns, size_t indent);

/// `text` as a link to the file `path` of this host.
std::string Linked(const std::string& path, const std::string& text);

}  // namespace ferrox::cli
