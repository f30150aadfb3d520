#pragma once

#include <sys/types.h>

#include <string>

#include "base/unique_fd.h"
#include "services/kovacontentextractd/child_process.h"

namespace ferrox::extract {

/// A worker program that has loaded what its readers need and then makes workers of itself, each by a fork: that takes
/// a millisecond where loading takes many. It never reads a file, nor hears of what its workers do, so no file can take
/// it over. For one thread at a time.
class WorkerTemplate {
 public:
  /// Starts the program. @throws Error kInternal with a sentence when it cannot be started.
  WorkerTemplate(const std::string& program, const std::string& empty_folder);

  /// Whether it lives.
  bool IsReady() const;
  /// Makes a worker that talks through `socket` and shares `region`. Waits for the program to be loaded.
  /// @return its process, a child of this one. @throws Error kInternal with a sentence when there is none.
  pid_t Fork(int socket, int region);

  const std::string& Program() const { return program_; }

 private:
  std::string program_;
  base::UniqueFd socket_;
  ChildProcess process_;
};

}  // namespace ferrox::extract
