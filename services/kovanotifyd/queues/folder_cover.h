#pragma once

#include <cstddef>
#include <string>
#include <vector>

namespace ferrox::notifyd {

/// A folder that is to be compared with the index, with everything below it. The watched folder, which is the path cut
/// to `root_size`, is the highest that may take its place.
struct ComparedFolder {
  std::string path;
  size_t root_size = 0;
};

/// Returns at most `most` folders that contain all of `folders`, or one for each watched folder if these are more.
/// Where many lie in one folder, that folder takes their place, while single ones elsewhere are returned as they are:
/// so a change of many files in one place costs no comparison of the others.
std::vector<ComparedFolder> CoverFolders(std::vector<ComparedFolder> folders, size_t most);

}  // namespace ferrox::notifyd
