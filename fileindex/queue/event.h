#pragma once

#include <cstddef>
#include <cstdint>
#include <string>

#include <json/value.h>

#include "common/export.h"

/// What one line of a share's queue says. The line's format is described in docs/formats/queue.md; queue_line.h writes
/// lines, Event reads one, and QueueMgr reads a queue's files.
namespace ferrox::fileindex {

/// Bits of a queue line's "event", in the order in which the tree handles those of one line. Each writer sets one bit a
/// line; a line without any asks for no operation.
enum EventBit : uint32_t {
  EVENT_CREATE = 0x40,          ///< a file: index it; a folder: reindex it and all below
  EVENT_ATTR = 0x4,             ///< owner, rights or times changed
  EVENT_MODIFY = 0x2,           ///< the content changed
  EVENT_DELETE = 0x80,          ///< a file is gone; a folder: reindex what may be left of it
  EVENT_RENAME = 0x100,         ///< what was at `path_old` is at `path`
  EVENT_REINDEX = 0x10000,      ///< compare the disk with the index, at the path and below
  EVENT_UPDATE_CFG = 0x20000,   ///< other kinds of files are wanted below the path: see Event::data
  EVENT_QUEUE_CRASHED = 0x200,  ///< events were lost: the whole share is reindexed
};

/// The longest line of a queue, without its newline. Writers refuse to write a longer one; readers skip it as malformed
/// and never hold more of it than this and a byte. Two paths of PATH_MAX bytes fit, whatever their escapes.
constexpr size_t kQueueLineMaxBytes = 256 * 1024;

/// One queue line, read. Nearly all lines have the plain form that event_scan.h reads; any other goes to the JSON
/// library, which also decides what is malformed.
struct FERROX_EXPORT Event {
  /// @param event_raw the line without its newline.
  /// @throws Error kMalformedEvent "Malformed event_raw: <line>" when the line is not one JSON value, is over
  /// kQueueLineMaxBytes or holds a NUL; kBadArgument when "event" or "path" is missing or unusable.
  explicit Event(const std::string& event_raw);

  uint32_t event = 0;    ///< a set of EventBit
  bool is_dir = false;   ///< false also where the line does not say
  std::string path;      ///< full path, as written: not checked, any bytes but NUL; of a rename, the new one
  std::string path_old;  ///< of a rename, the old full path; "" where the line has none
  Json::Value data;      ///< of a configuration change, its flags; null where the line has none
};

}  // namespace ferrox::fileindex
