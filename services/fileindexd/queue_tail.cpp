#include "services/fileindexd/queue_tail.h"

#include <fcntl.h>
#include <unistd.h>

#include <set>

#include "common/error.h"
#include "common/unique_fd.h"
#include "fileindex/optree.h"

namespace ferrox::indexd {

namespace {

/// More than the longest line.
constexpr size_t kChunkBytes = 512 * 1024;
constexpr size_t kFilesAtOnce = 500;

void TakeChangedFile(const std::string& line, std::set<std::string>& files) {
  try {
    const fileindex::Event event(line);
    const bool changed = event.event == fileindex::EVENT_CREATE || event.event == fileindex::EVENT_MODIFY;
    if (changed && !event.is_dir) files.insert(event.path);
  } catch (const Error&) {
    // Logged when the queue's turn comes.
  }
}

}  // namespace

std::vector<std::string> QueueTail::NextChangedFiles() {
  std::set<std::string> files;
  const UniqueFd file(open(path_.c_str(), O_RDONLY | O_CLOEXEC | O_NOFOLLOW | O_NONBLOCK));
  std::string chunk(kChunkBytes, '\0');
  const ssize_t size = file.Valid() ? pread(file.Get(), chunk.data(), chunk.size(), read_) : 0;
  chunk.resize(size > 0 ? static_cast<size_t>(size) : 0);
  size_t begin = 0;
  for (size_t end = 0; files.size() < kFilesAtOnce && (end = chunk.find('\n', begin)) != std::string::npos;) {
    TakeChangedFile(chunk.substr(begin, end - begin), files);
    begin = end + 1;
  }
  const bool overlong = begin == 0 && chunk.size() == kChunkBytes;
  read_ += static_cast<off_t>(overlong ? kChunkBytes : begin);
  return {files.begin(), files.end()};
}

}  // namespace ferrox::indexd
