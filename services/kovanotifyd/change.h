#pragma once

#include <cstdint>
#include <string>

namespace ferrox::notifyd {

/// One change of one name in a watched file system, as a watcher saw it.
struct Change {
  enum class Kind : uint8_t {
    kCreated,     ///< the name is new: made, linked, or moved here from where nothing is watched
    kModified,    ///< the content changed, and whoever changed it may still have the file open
    kWritten,     ///< a file that was open for writing was closed
    kAttributes,  ///< permissions, owner, times, extended attributes or the number of links
    kDeleted,     ///< the name is gone: removed, or moved to where nothing is watched
    kRenamed,     ///< from `old_path` to `path`; what had been at `path` is replaced
    kByNumber,    ///< the file `file` changed under a name that may tell nothing of its others, which are anywhere
    kUncertain,   ///< anything may have changed at and below the path, or nothing
  };

  Kind kind = Kind::kUncertain;
  bool is_folder = false;
  /// Full path at the moment of the change, as renames before it had left it and renames behind it have not yet changed
  /// it. Bytes as the file system has them.
  /// Of kByNumber, a root on the file's file system.
  std::string path;
  /// Of kRenamed, the full path until then; else "".
  std::string old_path = {};
  /// Of kByNumber, the file's number on its file system; else 0.
  uint64_t file = 0;
};

}  // namespace ferrox::notifyd
