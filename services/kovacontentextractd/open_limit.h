#pragma once

#include <chrono>
#include <list>
#include <mutex>
#include <string>

#include <json/value.h>

namespace ferrox::extract {

/// Bounds how many threads file systems can hold that do not answer, as one of a network does whose server is away:
/// those who open a file there cannot be told to stop. Files of other folders are opened meanwhile.
class OpenLimit {
 private:
  struct Opening {
    std::string root;
    std::chrono::steady_clock::time_point since;
  };

 public:
  struct Options {
    unsigned at_once = 16;  ///< openings in all
    unsigned held_max = 2;  ///< openings below one root that take long; beyond it there are no others
    std::chrono::milliseconds long_time = std::chrono::seconds(5);
  };
  explicit OpenLimit(const Options& options) : options_(options) {}

  /// A file below the folder `root` is being opened, or first read, for the life of this object.
  class Turn {
   public:
    /// @throws Error kInternal with a sentence when that is not to be tried now.
    Turn(OpenLimit& limit, const std::string& root) : limit_(limit), opening_(limit.Begin(root)) {}
    Turn(const Turn&) = delete;
    Turn& operator=(const Turn&) = delete;
    ~Turn() { limit_.End(opening_); }

   private:
    OpenLimit& limit_;
    std::list<Opening>::iterator opening_;
  };

  /// The folders where somebody has waited for long: an array of texts.
  Json::Value Held() const;

 private:
  std::list<Opening>::iterator Begin(const std::string& root);
  void End(std::list<Opening>::iterator opening);

  const Options options_;
  mutable std::mutex mutex_;
  std::list<Opening> openings_;  ///< the longest under way first
};

}  // namespace ferrox::extract
