#include "services/fileindexd/queue_tail.h"

#include <fcntl.h>
#include <unistd.h>

#include <functional>
#include <string_view>
#include <utility>

#include <json/value.h>

#include "base/unique_fd.h"
#include "common/error.h"
#include "fileindex/queue/event.h"
#include "fileindex/queue/queue_line.h"

namespace ferrox::indexd {

namespace {

/// More than the longest line.
constexpr size_t kChunkBytes = 512 * 1024;
constexpr size_t kFilesAtOnce = 500;
/// How such lines of the notification daemon begin (fileindex::AppendChangeLine).
constexpr std::string_view kAttributesLineBegin = "{\"event\":4,";
constexpr std::string_view kWriteLineBegin = "{\"event\":2,";

void TakeChangedFile(const std::string& line, std::set<std::string>& files) {
  try {
    const fileindex::Event event(line);
    const bool changed = event.event == fileindex::EVENT_CREATE || event.event == fileindex::EVENT_MODIFY;
    if (changed && !event.is_dir) files.insert(event.path);
  } catch (const Error&) {
    // Logged when the queue's turn comes.
  }
}

void TakePath(const std::string& line, std::set<std::string>& paths) {
  try {
    paths.insert(fileindex::Event(line).path);
  } catch (const Error&) {
    // Logged when the queue's turn comes.
  }
}

void TakeNumbers(const std::string& line, std::set<uint64_t>& files) {
  try {
    const fileindex::Event event(line);
    if (!event.data.isObject() || !event.data[fileindex::kFilesMember].isArray()) return;
    for (const Json::Value& file : event.data[fileindex::kFilesMember]) {
      if (file.isUInt64() && files.size() <= kChangedNumbersMax) files.insert(file.asUInt64());
    }
  } catch (const Error&) {
    // Logged by the reader of the queue's other lines.
  }
}

/// Hands out whole lines of one piece of a queue file from an offset on, until `take` has enough. @return the offset
/// behind the last; as it was at the end.
off_t ReadQueueLines(const std::string& path, off_t at, const std::function<bool(const std::string& line)>& take) {
  const base::UniqueFd file(open(path.c_str(), O_RDONLY | O_CLOEXEC | O_NOFOLLOW | O_NONBLOCK));
  std::string chunk(kChunkBytes, '\0');
  const ssize_t size = file.Valid() ? pread(file.Get(), chunk.data(), chunk.size(), at) : 0;
  chunk.resize(size > 0 ? static_cast<size_t>(size) : 0);
  size_t begin = 0;
  for (size_t end = 0; (end = chunk.find('\n', begin)) != std::string::npos;) {
    const bool is_more = take(chunk.substr(begin, end - begin));
    begin = end + 1;
    if (!is_more) break;
  }
  const bool overlong = begin == 0 && chunk.size() == kChunkBytes;
  return at + static_cast<off_t>(overlong ? kChunkBytes : begin);
}

}  // namespace

std::vector<std::string> QueueTail::NextChangedFiles() {
  std::set<std::string> files;
  read_ = ReadQueueLines(path_, read_, [&files](const std::string& line) {
    TakeChangedFile(line, files);
    return files.size() < kFilesAtOnce;
  });
  return {files.begin(), files.end()};
}

AttributeChanges QueueTail::NextAttributeChanges() {
  AttributeChanges changes;
  read_ = ReadQueueLines(path_, read_, [&changes](const std::string& line) {
    if (line.starts_with(fileindex::kFilesLineBegin)) TakeNumbers(line, changes.files);
    if (line.starts_with(kAttributesLineBegin) || line.starts_with(kWriteLineBegin)) TakePath(line, changes.paths);
    return true;
  });
  return changes;
}

std::set<uint64_t> ChangedNumbersIn(const std::string& queue_path) {
  std::set<uint64_t> files;
  for (off_t at = 0, before = -1; at != std::exchange(before, at);) {
    at = ReadQueueLines(queue_path, at, [&files](const std::string& line) {
      if (line.starts_with(fileindex::kFilesLineBegin)) TakeNumbers(line, files);
      return true;
    });
  }
  return files;
}

}  // namespace ferrox::indexd
