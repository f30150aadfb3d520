#pragma once

#include <string>
#include <utility>
#include <vector>

#include "services/kovacontentextractd/readers/reader.h"

namespace ferrox::extract {

/// A PNG file without its picture, which is most of it.
struct PngParts {
  std::string file;                                        ///< a PNG file again; empty where it was none
  std::vector<std::pair<std::string, std::string>> texts;  ///< keyword and text, those that are not packed
};

/// Reads the chunks of a PNG file; a damaged one as far as it goes.
PngParts ReadPngParts(const Source& source);

}  // namespace ferrox::extract
