#pragma once

#include <atomic>
#include <chrono>
#include <cstdint>

namespace ferrox::indexd {

/// The pause of all indexing, as the "pause" and "resume" commands set it. One object for all workers; every call is
/// safe from any thread.
class PauseState {
 public:
  /// `resume_time`: seconds since the epoch at which the pause ends; 0: a pause without end; -1: no pause.
  void Set(int64_t resume_time) { resume_time_ = resume_time; }
  int64_t ResumeTime() const { return resume_time_; }
  bool Paused() const;
  /// How long it still lasts, at most an hour: the clock may be set meanwhile.
  std::chrono::milliseconds Left() const;

 private:
  std::atomic<int64_t> resume_time_{-1};
};

}  // namespace ferrox::indexd
