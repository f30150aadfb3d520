#pragma once

#include <charconv>
#include <cstdint>
#include <optional>
#include <string_view>

namespace ferrox::engine {

/// A document's "_KOVAStamp", cut into its parts: SIZE.MTIME.CTIME.INODE, times in nanoseconds since the epoch.
struct FileStamp {
  std::string_view content;  ///< SIZE.MTIME
  int64_t changed_ns;        ///< CTIME: when content, rights or names last changed
  std::string_view inode;

  /// Nothing when the text is no stamp.
  static std::optional<FileStamp> Parse(std::string_view text) {
    const size_t mtime = text.find('.');
    const size_t ctime = text.find('.', mtime + 1);
    const size_t inode = text.find('.', ctime + 1);
    if (mtime == text.npos || ctime == text.npos || inode == text.npos) return std::nullopt;
    FileStamp stamp{text.substr(0, ctime), 0, text.substr(inode + 1)};
    const char* const end = text.data() + inode;
    const auto read = std::from_chars(text.data() + ctime + 1, end, stamp.changed_ns);
    return read.ec == std::errc() && read.ptr == end ? std::optional(stamp) : std::nullopt;
  }

  bool SameContent(const FileStamp& other) const { return content == other.content && inode == other.inode; }
  int64_t ChangedSec() const {
    constexpr int64_t kSecond = 1000000000;
    return changed_ns / kSecond - (changed_ns % kSecond < 0 ? 1 : 0);
  }
};

}  // namespace ferrox::engine
