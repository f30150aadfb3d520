#pragma once

#include <chrono>
#include <climits>
#include <list>
#include <string>

#include <json/value.h>

#include "base/mutex.h"

namespace ferrox::services {

/// Bounds how many threads hang in file systems that do not answer, such as a network file system whose server is away.
/// A thread in open(2) or in a first read there cannot be interrupted; without a bound, a few requests for files of one
/// dead mount would take every thread of the daemon, and files of other folders would wait too. Any thread may call any
/// member; none blocks.
class OpenLimit {
 private:
  /// One that is under way.
  struct Opening {
    std::string root;
    std::chrono::steady_clock::time_point since;
  };

 public:
  struct Options {
    unsigned at_once = 16;  ///< openings in all
    unsigned held_max = 2;  ///< openings below one root that last long; with so many, no further one begins there
    std::chrono::milliseconds long_time = std::chrono::seconds(5);
    unsigned root_at_once = UINT_MAX;  ///< openings below one root, however long they last
  };
  explicit OpenLimit(const Options& options) : options_(options) {}

  /// Counts one opening, or first read, of a file below the folder `root` for the life of this object.
  class Turn {
   public:
    /// @throws Error kInternal with a sentence when a limit is reached; the file is then to be tried again later.
    Turn(OpenLimit& limit, const std::string& root) : limit_(limit), opening_(limit.Begin(root)) {}
    Turn(const Turn&) = delete;
    Turn& operator=(const Turn&) = delete;
    ~Turn() { limit_.End(opening_); }

   private:
    OpenLimit& limit_;
    std::list<Opening>::iterator opening_;
  };

  /// The roots below which an opening has lasted for long_time or more: a JSON array of texts.
  Json::Value Held() const;

 private:
  // What a Turn does at its begin and end.
  std::list<Opening>::iterator Begin(const std::string& root);
  void End(std::list<Opening>::iterator opening);

  const Options options_;
  mutable base::Mutex mutex_;
  std::list<Opening> openings_ BASE_GUARDED_BY(mutex_);  ///< the longest under way first
};

}  // namespace ferrox::services
