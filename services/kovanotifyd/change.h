#pragma once

#include <cstdint>
#include <string>

namespace ferrox::notifyd {

/// One change of one name in a watched file system: what every watcher makes of the kernel's records, and the router
/// makes lines of.
struct Change {
  enum class Kind : uint8_t {
    kCreated,             ///< the name is new: made, linked, or moved here from a place that is not watched
    kModified,            ///< the content changed, and the file may still be open for writing
    kWritten,             ///< a file that was open for writing was closed
    kAttributes,          ///< permissions, owner, times, extended attributes or the number of links
    kDeleted,             ///< the name is gone: removed, or moved to a place that is not watched
    kRenamed,             ///< from `old_path` to `path`, in place of what was there
    kByNumber,            ///< the content of the file number `file` changed; its names are not known
    kAttributesByNumber,  ///< the same of its attributes, and perhaps its content
    kUncertain,           ///< anything may have changed at and below the path, or nothing
  };

  Kind kind = Kind::kUncertain;
  bool is_folder = false;
  /// The full path at the moment of the change: after all renames that were reported before, before those that will be.
  /// Any bytes that the file system allows. Of a change by number, a root on the file system of the file; of
  /// kAttributes, also a root in place of a folder above it, which no root holds.
  std::string path;
  /// Of kRenamed, the full path before; else "".
  std::string old_path = {};
  /// Of a change by number, the file's number on its file system; else 0.
  uint64_t file = 0;
};

}  // namespace ferrox::notifyd
