#pragma once

#include <string>
#include <string_view>

namespace ferrox::extract {

/// What a GIF file says of itself between its pictures.
struct GifTexts {
  std::string comment;  ///< several on lines of their own
  std::string xmp;      ///< a packet of XMP
};

/// Looks through the first few MiB of the file.
GifTexts ReadGifTexts(std::string_view file);

}  // namespace ferrox::extract
