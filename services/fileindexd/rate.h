#pragma once

#include <array>
#include <cstdint>

namespace ferrox::indexd {

/// How many a second there were, over the last ten seconds. Times are of a clock that does not jump, in milliseconds.
class Rate {
 public:
  void Count(int64_t now_ms, uint64_t count);
  /// Averaged from the first of those seconds in which something was counted on, so that the rate of work that has
  /// just begun is not too low.
  double PerSecond(int64_t now_ms) const;

 private:
  static constexpr int64_t kSeconds = 10;
  struct Bucket {
    int64_t second = -kSeconds;
    uint64_t count = 0;
  };
  std::array<Bucket, kSeconds> buckets_;  ///< a ring: second s counts in bucket s % 10
};

}  // namespace ferrox::indexd
