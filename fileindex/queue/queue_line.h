#pragma once

#include <cstdint>
#include <set>
#include <string>
#include <string_view>

#include <json/forwards.h>

#include "common/export.h"

/// All writing of queue lines (docs/formats/queue.md); Event reads them. Each line comes with its newline. Names may
/// hold any bytes but NUL and are written as they are, apart from quotes, backslashes and control characters.
///
/// The two writers' lines differ in form, and readers take both: the library's has its members in the order of the
/// alphabet, leaves "is_dir" out and may carry data of any kind; the notification daemon's is written without the JSON
/// library, since a busy host has thousands a second.
namespace ferrox::fileindex {

/// The line of a management operation. It may be longer than kQueueLineMaxBytes: the caller refuses it then.
std::string CustomEventLine(int event, const std::string& path, const std::string& path_old, const Json::Value& data);

/// Appends to `text` the line of a change on disk. `event` is one EventBit; `path_old` is "" except of a rename. With
/// paths below PATH_MAX the line is shorter than kQueueLineMaxBytes, however many bytes are escaped.
FERROX_EXPORT void AppendChangeLine(std::string& text, uint32_t event, bool is_folder, std::string_view path,
                                    std::string_view path_old);

/// Appends to `text` a line of event 0 that gives files by their inode numbers, for changes under names that the share
/// does not have. `folder` is one that the queue watches; `files` is not empty. At 21 bytes a number, the caller bounds
/// how many a line holds.
FERROX_EXPORT void AppendFilesLine(std::string& text, std::string_view folder, const std::set<uint64_t>& files);

/// How each line of AppendFilesLine begins, and no line of the library: a reader that wants the numbers alone passes
/// over the others without parsing them.
inline constexpr std::string_view kFilesLineBegin = "{\"event\":0,";
/// The member of such a line's data that is the array of the numbers.
inline constexpr char kFilesMember[] = "files";

}  // namespace ferrox::fileindex
