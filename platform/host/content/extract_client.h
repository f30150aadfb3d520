#pragma once

#include <cstdint>
#include <string>

#include <json/value.h>

namespace kova::content {

/// What the extraction daemon says of a file.
struct Extraction {
  bool gone = false;     ///< there is no file at the path
  uint64_t inode = 0;    ///< of the file that was opened; 0: none was
  Json::Value document;  ///< what it holds
};

/// Has the daemon read the file at `path`, and starts the daemon when it does not run. Blocks for the reading of one
/// file and of those before it.
/// @throws std::runtime_error with a sentence when content cannot be read now, whatever the file; ExtractionProblem
/// then returns it.
Extraction ExtractContent(const std::string& path);

/// Forgets the problem of an earlier call of this thread.
void ClearExtractionProblem();

}  // namespace kova::content
