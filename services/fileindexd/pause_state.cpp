#include "services/fileindexd/pause_state.h"

#include <algorithm>

#include "common/clock.h"

namespace ferrox::indexd {

bool PauseState::Paused() const {
  const int64_t resume_time = resume_time_;
  return resume_time == 0 || (resume_time > 0 && Clock::Get().Now() < resume_time);
}

std::chrono::milliseconds PauseState::Left() const {
  const int64_t resume_time = resume_time_;
  if (resume_time == 0) return std::chrono::hours(1);
  return std::chrono::seconds(std::clamp<int64_t>(resume_time - Clock::Get().Now(), 0, 3600));
}

}  // namespace ferrox::indexd
