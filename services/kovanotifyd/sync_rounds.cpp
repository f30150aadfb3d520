#include "services/kovanotifyd/sync_rounds.h"

#include <algorithm>
#include <utility>

#include "common/log.h"

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

void SyncRounds::DropRequests() {
  next_.clear();
  current_.clear();
}

void SyncRounds::Begin(const RootTable& roots) {
  is_running_ = true;
  current_ = std::exchange(next_, {});
  problems_.clear();
  for (size_t way = 0; way < cookies_.size(); ++way) {
    if (!roots.IsCovering(way)) continue;
    if (cookies_[way].Touch()) {
      states_[way] = CookieState::kOutstanding;
    } else {
      problems_.push_back("changes may be on their way: " + cookies_[way].Path() +
                          " cannot be changed: " + ErrnoText());
    }
  }
}

bool SyncRounds::IsDone(const RootTable& roots) {
  if (roots.IsSettingUp()) return false;
  for (const size_t way : Outstanding()) {
    if (!roots.IsCovering(way)) states_[way] = CookieState::kIdle;
  }
  return Outstanding().empty();
}

void SyncRounds::End(const Problems& problems) {
  is_running_ = false;
  problems_.insert(problems_.end(), problems.begin(), problems.end());
  for (Request& request : std::exchange(current_, {})) request.promise.set_value({problems_});
}

std::vector<size_t> SyncRounds::Outstanding() const {
  std::vector<size_t> ways;
  for (size_t way = 0; way < states_.size(); ++way) {
    if (states_[way] != CookieState::kIdle) ways.push_back(way);
  }
  return ways;
}

void SyncRounds::OnLost(size_t way) {
  if (states_[way] == CookieState::kOutstanding) states_[way] = CookieState::kMaybeLost;
}

void SyncRounds::OnAllRead(size_t way) {
  if (states_[way] == CookieState::kMaybeLost) states_[way] = CookieState::kIdle;
}

}  // namespace ferrox::notifyd
