#include "services/kovanotifyd/sync_rounds.h"

#include <algorithm>
#include <utility>

namespace ferrox::notifyd {

SyncRounds::TimePoint SyncRounds::Expire(TimePoint now, const std::string& sentence) {
  TimePoint next = TimePoint::max();
  for (std::vector<Request>* requests : {&current_, &next_}) {
    for (auto it = requests->begin(); it != requests->end();) {
      if (it->deadline <= now) {
        it->promise.set_value({{}, sentence});
        it = requests->erase(it);
      } else {
        next = std::min(next, it->deadline);
        ++it;
      }
    }
  }
  return next;
}

std::vector<size_t> SyncRounds::Outstanding() const {
  std::vector<size_t> ways;
  for (size_t way = 0; way < cookies_.size(); ++way) {
    if (cookies_[way] != Cookie::kIdle) ways.push_back(way);
  }
  return ways;
}

void SyncRounds::Begin() {
  is_running_ = true;
  current_ = std::exchange(next_, {});
}

void SyncRounds::Lost(size_t way) {
  if (cookies_[way] == Cookie::kOutstanding) cookies_[way] = Cookie::kUncertain;
}

/// What was lost is compared; the cookie's own change came before this moment, or was lost with the others.
void SyncRounds::Drained(size_t way) {
  if (cookies_[way] == Cookie::kUncertain) cookies_[way] = Cookie::kIdle;
}

void SyncRounds::End(const Problems& problems) {
  is_running_ = false;
  for (Request& request : std::exchange(current_, {})) request.promise.set_value({problems});
}

}  // namespace ferrox::notifyd
