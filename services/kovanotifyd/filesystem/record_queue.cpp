#include "services/kovanotifyd/filesystem/record_queue.h"

#include <malloc.h>

#include <utility>

namespace ferrox::notifyd {

namespace {

/// So many records in the window have taken a megabyte of memory or more.
constexpr size_t kBurst = 4096;

}  // namespace

bool RecordQueue::ReadBatch() {
  FanBatch batch;
  if (!group_.IsOpen() || group_.Read(batch) != 0) return false;
  window_.Add(std::move(batch));
  if (window_.Size() > kBurst) was_burst_ = true;
  return true;
}

FolderSource::Answer RecordQueue::ReadPlace(const HandleKey& folder, FolderPlace& place) {
  const Answer answer = mounts_.ReadPlace(folder, place);
  const auto removed = answer == Answer::kNowhere ? removed_.find(folder) : removed_.end();
  if (removed == removed_.end()) return answer;
  place = removed->second;
  return Answer::kPlace;
}

void RecordQueue::Drain(RecordWindow&) {
  while (window_.Size() < records_max_) {
    if (!ReadBatch()) return;
  }
  is_overrun_ = true;
}

void RecordQueue::NoteRemoved(const HandleKey& folder, const FolderPlace& place) {
  if (removed_.size() < records_max_) removed_[folder] = place;
}

void RecordQueue::NoteMoved(const HandleKey& folder, const FolderPlace& place) {
  const auto removed = removed_.find(folder);
  if (removed != removed_.end()) removed->second = place;
}

bool RecordQueue::DropIfOverrun() {
  if (!std::exchange(is_overrun_, false)) return false;
  window_.Clear();
  return true;
}

void RecordQueue::Rest() {
  removed_.clear();
  if (std::exchange(was_burst_, false)) (void)malloc_trim(0);
}

}  // namespace ferrox::notifyd
