#pragma once

#include <sys/socket.h>

#include <chrono>
#include <string>

#include <json/value.h>

#include "base/unique_fd.h"
#include "services/kovacontentextractd/child_process.h"

namespace ferrox::extract {

class WorkerTemplate;

/// One file to be read by a worker.
struct Task {
  int fd = -1;            ///< of the file, open for reading; the caller's
  std::string reader;     ///< which of the program's readers
  std::string extension;  ///< in lower case
  std::string name;
  int depth = 0;  ///< how many files it is inside of
};

/// What a worker says, of which nothing is to be believed.
struct RawAnswer {
  std::string json;
  size_t text_bytes = 0;  ///< of the text in its region
};

/// A worker that runs, as the daemon sees it: a child process, a socket, a region of memory that both share. It may be
/// taken over by the file that it reads, so nothing that it does can block the daemon for longer than a time-out or
/// make it allocate more than kAnswerMaxBytes. For one thread at a time, apart from Interrupt.
class WorkerProcess {
 public:
  /// Has the template make one, and waits until it has closed its sandbox.
  /// @throws Error kInternal with a sentence when that fails.
  explicit WorkerProcess(WorkerTemplate& prepared);

  /// The pieces of the sandbox that this kernel lacks: an array of texts.
  const Json::Value& Missing() const { return missing_; }
  /// Whether it lives and waits for a file.
  bool IsReady() const;
  /// How many files it was given.
  unsigned FilesRead() const { return requests_; }
  /// The memory that it shares with this process: a file.
  int Region() const { return region_.Get(); }

  enum class Outcome {
    kAnswered,
    kNotAsked,  ///< it had ended before it saw the file, or still talked of another one
    kTookTooLong,
    kNoMemory,
    kCrashed,
    kNonsense,  ///< it sent what is no frame
    kHeld,      ///< it cannot even be killed: the file system does not answer
  };
  /// Has it read a file. Unless it answered, it has ended.
  Outcome Ask(const Task& task, std::chrono::milliseconds longest, RawAnswer& answer);
  /// From another thread: lets Ask return soon, as if the worker had ended.
  void Interrupt() { (void)shutdown(socket_.Get(), SHUT_RDWR); }

 private:
  using TimePoint = std::chrono::steady_clock::time_point;

  bool Send(const Task& task);
  Outcome Receive(TimePoint end, RawAnswer& answer);
  Outcome ReceiveSome(char* to, size_t room, TimePoint end, size_t& have);
  Outcome HowItEnded();

  base::UniqueFd socket_;
  base::UniqueFd region_;
  ChildProcess process_;
  Json::Value missing_ = Json::Value(Json::arrayValue);
  uint32_t requests_ = 0;  ///< the number of the last request; answers repeat it
};

}  // namespace ferrox::extract
