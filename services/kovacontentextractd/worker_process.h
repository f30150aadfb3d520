#pragma once

#include <sys/types.h>

#include <chrono>
#include <string>

#include <json/value.h>

#include "common/unique_fd.h"

namespace ferrox::extract {

/// One file to be read by a worker.
struct Task {
  int fd = -1;            ///< of the file, open for reading; the caller's
  std::string reader;     ///< which of the program's readers
  std::string extension;  ///< in lower case
  std::string name;
};

/// A worker program that runs. It may be at the mercy of the file that it reads.
class WorkerProcess {
 public:
  /// Starts the program and waits until it has closed its sandbox.
  /// @throws Error kInternal with a sentence when it cannot be started.
  WorkerProcess(const std::string& program, const std::string& empty_folder);
  WorkerProcess(const WorkerProcess&) = delete;
  WorkerProcess& operator=(const WorkerProcess&) = delete;
  /// Ends it at once.
  ~WorkerProcess();

  /// The pieces of the sandbox that this kernel lacks: an array of texts.
  const Json::Value& Missing() const { return missing_; }
  /// Whether it lives and waits for a file.
  bool IsReady() const;
  unsigned FilesRead() const { return requests_; }

  enum class Outcome {
    kAnswered,
    kNotAsked,  ///< it had ended before it saw the file, or still talked of another one
    kTookTooLong,
    kNoMemory,
    kCrashed,
    kNonsense,  ///< it sent what is no frame
  };
  /// Has it read a file. Unless it answered, it has ended.
  Outcome Ask(const Task& task, std::chrono::milliseconds longest, std::string& answer);

 private:
  using TimePoint = std::chrono::steady_clock::time_point;

  bool Send(const Task& task);
  Outcome Receive(TimePoint end, std::string& answer);
  Outcome ReadExactly(size_t bytes, TimePoint end, std::string& to);
  void Start(const std::string& program, const std::string& empty_folder);
  Outcome HowItEnded();
  void End();
  int Reap(std::chrono::milliseconds longest);

  pid_t pid_ = -1;
  UniqueFd socket_;
  Json::Value missing_ = Json::Value(Json::arrayValue);
  uint32_t requests_ = 0;
};

}  // namespace ferrox::extract
