#pragma once

#include <string>
#include <string_view>

namespace ferrox::extract {

/// What a HEIF or AVIF file has beside its pictures.
struct HeifParts {
  std::string exif;  ///< from its TIFF head on
  std::string xmp;
};

/// Both are empty where the file is none of these, or has none of them.
HeifParts ReadHeifParts(std::string_view file);

}  // namespace ferrox::extract
