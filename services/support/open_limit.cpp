#include "services/support/open_limit.h"

#include <algorithm>
#include <set>

#include "common/error.h"
#include "common/log.h"

namespace ferrox::services {

std::list<OpenLimit::Opening>::iterator OpenLimit::Begin(const std::string& root) {
  const auto now = std::chrono::steady_clock::now();
  const base::MutexLock guard(mutex_);
  const auto held = std::count_if(openings_.begin(), openings_.end(), [&](const Opening& one) {
    return one.root == root && now - one.since >= options_.long_time;
  });
  FERROX_FAIL_IF(held >= static_cast<int64_t>(options_.held_max), Error::kInternal,
                 "the file system of " + root + " does not answer");
  const auto at_root =
      std::count_if(openings_.begin(), openings_.end(), [&](const Opening& one) { return one.root == root; });
  const bool full = openings_.size() >= options_.at_once || at_root >= static_cast<int64_t>(options_.root_at_once);
  FERROX_FAIL_IF(full, Error::kInternal, "too many files are being opened; does a file system not answer?");
  return openings_.insert(openings_.end(), {root, now});
}

void OpenLimit::End(std::list<Opening>::iterator opening) {
  const base::MutexLock guard(mutex_);
  openings_.erase(opening);
}

Json::Value OpenLimit::Held() const {
  const auto now = std::chrono::steady_clock::now();
  std::set<std::string> roots;
  {
    const base::MutexLock guard(mutex_);
    for (const Opening& one : openings_) {
      if (now - one.since >= options_.long_time) roots.insert(one.root);
    }
  }
  Json::Value held(Json::arrayValue);
  for (const std::string& root : roots) held.append(root);
  return held;
}

}  // namespace ferrox::services
