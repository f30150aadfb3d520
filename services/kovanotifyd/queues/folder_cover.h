#pragma once

#include <cstddef>
#include <string>
#include <vector>

namespace ferrox::notifyd {

/// A folder whose comparison is wanted, with all below it. The path cut to `root_size` is as far up as it may be
/// replaced by a folder above it.
struct Place {
  std::string path;
  size_t root_size = 0;
};

/// Few places that cover all of `places`: at most `most`, unless there are more roots than that. Where many places lie
/// in a folder, that folder stands for them; single ones elsewhere stay as they are.
std::vector<Place> CoverPlaces(std::vector<Place> places, size_t most);

}  // namespace ferrox::notifyd
