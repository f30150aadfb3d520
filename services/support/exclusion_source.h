#pragma once

#include <cstddef>
#include <memory>
#include <string>
#include <string_view>

#include "base/ignore_patterns.h"
#include "base/pattern_lists.h"

namespace ferrox::services {

/// The name of the files in shared folders in which people say what is left out (docs/exclusions.md).
inline constexpr char kIgnoreFileName[] = ".indexignore";
inline constexpr size_t kIgnoreFileBytesMax = size_t{64} * 1024;
inline constexpr size_t kIgnorePatternsMax = 1000;

/// Patterns of one origin: the defaults, the settings, an indexed folder's, or one file's. Immutable once made.
struct ExclusionSource {
  std::string origin;  ///< for people: "default", "the settings", "folder set of /photo", or the file's path
  bool is_file = false;
  base::IgnorePatterns exclude;
  base::IgnorePatterns exclude_content;
};

/// Null where the lists are empty.
std::shared_ptr<const ExclusionSource> SourceOf(const std::string& origin, const base::PatternLists& lists);

/// Adds the patterns of an ignore file: gitignore's syntax, in which "#: name only" alone on a line begins patterns by
/// which names stay, and "#: not at all" ends them. @return why they are refused, a sentence without its end; "" when
/// they are not.
std::string AddIgnoreFileText(std::string_view text, ExclusionSource& source);

/// What one folder's ignore file comes to.
struct IgnoreFile {
  std::shared_ptr<const ExclusionSource> source;  ///< null without a file, or when it is refused
  std::string refused;                            ///< why it is not followed, a sentence without its end; "" otherwise
};

/// Reads the ignore file in `folder`, at or below `root`. Followed is only a regular file without further names, of the
/// folder's owner or root's, that is reached from the root without a link. Never waits for a FIFO's writer.
IgnoreFile ReadIgnoreFile(const std::string& root, const std::string& folder);

}  // namespace ferrox::services
