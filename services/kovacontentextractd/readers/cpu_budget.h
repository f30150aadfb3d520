#pragma once

#include <time.h>

#include <chrono>

namespace ferrox::extract {

/// The processor time that something may take, from the making of the object on. For readers whose library works on
/// and on over damaged files: what was found until then is worth more than the word that it took too long.
class CpuBudget {
 public:
  explicit CpuBudget(std::chrono::milliseconds budget) : end_(Used() + budget) {}
  /// Asks the kernel, so not for every byte.
  bool IsSpent() const { return Used() > end_; }

 private:
  /// By this process since its start.
  static std::chrono::nanoseconds Used() {
    timespec used = {};
    (void)clock_gettime(CLOCK_PROCESS_CPUTIME_ID, &used);
    return std::chrono::seconds(used.tv_sec) + std::chrono::nanoseconds(used.tv_nsec);
  }

  std::chrono::nanoseconds end_;
};

}  // namespace ferrox::extract
