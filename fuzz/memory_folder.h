#pragma once

#include <stdlib.h>
#include <unistd.h>

#include <filesystem>
#include <string>

namespace ferrox::test {

/// A new folder in memory, where there is such a place: a target that waits for a disk tries little.
inline std::string MakeMemoryFolder(const std::string& name) {
  const bool in_memory = access("/dev/shm", W_OK | X_OK) == 0;
  const std::filesystem::path place = in_memory ? "/dev/shm" : std::filesystem::temp_directory_path();
  std::string pattern = place / (name + "-XXXXXX");
  return mkdtemp(pattern.data()) == nullptr ? std::string("/nonexistent") : pattern;
}

}  // namespace ferrox::test
