#include "services/kovaelasticd/indices/rebuild_state.h"

#include <algorithm>

#include "common/clock.h"
#include "common/json_util.h"

namespace ferrox::engine {

bool RebuildState::MayBegin(int64_t now) const {
  const auto is_recent = [now](int64_t time) { return time > now - kDaySec && time <= now; };
  return std::count_if(times_.begin(), times_.end(), is_recent) < static_cast<ptrdiff_t>(kInADay);
}

void RebuildState::Begin(int64_t now, const std::string& reason, bool asked) {
  since_ = std::max(now, since_ + 1);  // no two are the same
  reason_ = reason;
  made_ = false;
  if (asked) {
    times_.clear();
    return;
  }
  times_.push_back(now);
  if (times_.size() > kInADay) times_.erase(times_.begin());
}

Json::Value RebuildState::ToJson() const {
  if (since_ == 0 && times_.empty()) return Json::Value();
  Json::Value stored;
  stored["since"] = Json::Int64(since_);
  stored["reason"] = reason_;
  stored["made"] = made_;
  for (const int64_t time : times_) stored["times"].append(Json::Int64(time));
  return stored;
}

RebuildState RebuildState::FromJson(const Json::Value& stored) {
  RebuildState state;
  long long since = 0;
  GetJsonValue(since, stored, "since", false);
  state.since_ = since;
  GetJsonValue(state.reason_, stored, "reason", false);
  GetJsonValue(state.made_, stored, "made", false);
  Json::Value times(Json::arrayValue);
  GetJsonValue(times, stored, "times", false);
  for (const Json::Value& time : times) {
    if (time.isInt64()) state.times_.push_back(time.asInt64());
  }
  return state;
}

}  // namespace ferrox::engine
