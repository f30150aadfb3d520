#pragma once

#include <sys/stat.h>

#include <charconv>
#include <cstdint>
#include <optional>
#include <string>
#include <string_view>

namespace base {

/// What a look at a file tells of it without reading it: a document's "_KOVAStamp", whose text is
/// SIZE.MTIME.CTIME.INODE, each a decimal number. Times are in nanoseconds since the epoch, and may be before it.
struct FileStamp {
  static constexpr size_t kMaxBytes = 4 * 20 + 3;

  uint64_t size = 0;
  int64_t modified_ns = 0;
  int64_t changed_ns = 0;  ///< when content, rights or names last changed
  uint64_t inode = 0;

  static int64_t Nanoseconds(int64_t seconds, int64_t nanoseconds) { return seconds * kSecond + nanoseconds; }
  static FileStamp Of(const struct stat& status) {
    return {static_cast<uint64_t>(status.st_size), Nanoseconds(status.st_mtim.tv_sec, status.st_mtim.tv_nsec),
            Nanoseconds(status.st_ctim.tv_sec, status.st_ctim.tv_nsec), static_cast<uint64_t>(status.st_ino)};
  }

  /// Nothing when `text` is no stamp.
  static std::optional<FileStamp> Parse(std::string_view text) {
    FileStamp stamp;
    const bool parsed = TakeNumber(text, stamp.size) && TakeDot(text) && TakeNumber(text, stamp.modified_ns) &&
                        TakeDot(text) && TakeNumber(text, stamp.changed_ns) && TakeDot(text) &&
                        TakeNumber(text, stamp.inode) && text.empty();
    return parsed ? std::optional(stamp) : std::nullopt;
  }

  /// Writes the text, without a zero behind it, into kMaxBytes bytes. @return its end.
  char* Write(char* out) const {
    char* const end = out + kMaxBytes;
    out = std::to_chars(out, end, size).ptr;
    for (const int64_t time : {modified_ns, changed_ns}) {
      *out++ = '.';
      out = std::to_chars(out, end, time).ptr;
    }
    *out++ = '.';
    return std::to_chars(out, end, inode).ptr;
  }
  std::string Text() const {
    char text[kMaxBytes];
    return {text, Write(text)};
  }

  bool operator==(const FileStamp&) const = default;
  bool SameFile(const FileStamp& other) const { return inode == other.inode; }
  /// Also of the same content, as far as size and mtime tell.
  bool SameContent(const FileStamp& other) const {
    return SameFile(other) && size == other.size && modified_ns == other.modified_ns;
  }
  int64_t ChangedSec() const { return changed_ns / kSecond - (changed_ns % kSecond < 0 ? 1 : 0); }

 private:
  static constexpr int64_t kSecond = 1000000000;

  static bool TakeDot(std::string_view& text) {
    if (text.empty() || text.front() != '.') return false;
    text.remove_prefix(1);
    return true;
  }
  template <typename Number>
  static bool TakeNumber(std::string_view& text, Number& number) {
    const auto read = std::from_chars(text.data(), text.data() + text.size(), number);
    text.remove_prefix(static_cast<size_t>(read.ptr - text.data()));
    return read.ec == std::errc();
  }
};

/// The number of the file that a text ends in behind its last ".", as a stamp does; 0: it is not known.
inline uint64_t FileNumber(std::string_view text) {
  const size_t dot = text.rfind('.');
  uint64_t file = 0;
  if (dot != text.npos) (void)std::from_chars(text.data() + dot + 1, text.data() + text.size(), file);
  return file;
}

}  // namespace base
