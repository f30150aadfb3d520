#define FERROX_SOURCE "optree"

#include "fileindex/queue/event_line_reader.h"

#include <fcntl.h>
#include <unistd.h>

#include <cerrno>
#include <cstring>

#include "common/log.h"
#include "fileindex/queue/event.h"

namespace ferrox::fileindex {

namespace {

/// Of one read. The buffer holds the longest line and one read more, so that Fill has room for a whole read whenever it
/// is called: what is then held is at most a line.
constexpr size_t kReadBytes = 64 * 1024;
constexpr size_t kBufferBytes = kQueueLineMaxBytes + kReadBytes;

}  // namespace

EventLineReader::EventLineReader(const std::string& queue_path)
    : buffer_(new char[kBufferBytes]), file_(open(queue_path.c_str(), O_RDONLY | O_CLOEXEC)) {}

/// Bytes that were searched for a newline once are not searched again when more has come: a line that arrives in pieces
/// costs its length, not its square.
bool EventLineReader::Next(std::string_view& line) {
  if (skipping_) SkipRestOfLine();
  size_t searched = 0;
  for (;;) {
    const char* const start = buffer_.get() + start_;
    const size_t held = end_ - start_;
    const auto* newline = static_cast<const char*>(memchr(start + searched, '\n', held - searched));
    const size_t length = newline != nullptr ? static_cast<size_t>(newline - start) : held;
    // Also when its end has not been read yet: what is held of it is enough to refuse it.
    if (length > kQueueLineMaxBytes) {
      line = {start, kQueueLineMaxBytes + 1};
      start_ += line.size();
      skipping_ = true;
      return true;
    }
    if (newline != nullptr) {
      line = {start, length};
      start_ += length + 1;
      return true;
    }
    // At the end of the file, what is left is the last line, unless it is empty.
    searched = held;
    if (!Fill()) {
      line = {buffer_.get() + start_, held};
      start_ = end_;
      return held != 0;
    }
  }
}

/// Reads on behind what is held, which moves to the front. False at the end of the file.
bool EventLineReader::Fill() {
  memmove(buffer_.get(), buffer_.get() + start_, end_ - start_);
  end_ -= start_;
  start_ = 0;
  ssize_t got = 0;
  do {
    got = read(file_.Get(), buffer_.get() + end_, kReadBytes);
  } while (got < 0 && errno == EINTR);
  // An unreadable queue must not pass for a short one: it would be deleted with the events that were not seen.
  FERROX_FAIL_IF(0 > got, Error::kInternal, "Failed to read queue, reason=" + ErrnoText());
  end_ += static_cast<size_t>(got);
  return got > 0;
}

/// Reads up to behind the newline of the line that was cut short, or to the end, keeping nothing.
void EventLineReader::SkipRestOfLine() {
  skipping_ = false;
  for (;;) {
    const char* const start = buffer_.get() + start_;
    const auto* newline = static_cast<const char*>(memchr(start, '\n', end_ - start_));
    if (newline != nullptr) {
      start_ += static_cast<size_t>(newline - start) + 1;
      return;
    }
    start_ = end_;
    if (!Fill()) return;
  }
}

}  // namespace ferrox::fileindex
