#include "services/fileindexd/rate.h"

#include <algorithm>
#include <cstddef>

namespace ferrox::indexd {

void Rate::Count(int64_t now_ms, uint64_t count) {
  const int64_t second = now_ms / 1000;
  Bucket& bucket = buckets_[static_cast<size_t>(second % kSeconds)];
  if (bucket.second != second) bucket = {second, 0};
  bucket.count += count;
}

double Rate::PerSecond(int64_t now_ms) const {
  uint64_t sum = 0;
  int64_t since_ms = now_ms;
  for (const Bucket& bucket : buckets_) {
    if (bucket.second <= now_ms / 1000 - kSeconds) continue;
    sum += bucket.count;
    since_ms = std::min(since_ms, bucket.second * 1000);
  }
  return sum == 0 ? 0
                  : static_cast<double>(sum) * 1000 / static_cast<double>(std::max<int64_t>(now_ms - since_ms, 1000));
}

}  // namespace ferrox::indexd
