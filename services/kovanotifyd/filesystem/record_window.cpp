#include "services/kovanotifyd/filesystem/record_window.h"

#include <utility>

namespace ferrox::notifyd {

bool RecordWindow::IsRelocation(const FanRecord& record) {
  return record.IsFolder() && (record.mask & (FAN_RENAME | FAN_DELETE)) != 0 && !record.target.empty();
}

void RecordWindow::Add(FanBatch batch) {
  if (batch.records.empty()) return;
  size_ += batch.records.size();
  batches_.push_back(std::move(batch));
  for (const FanRecord& record : batches_.back().records) {
    if (IsRelocation(record)) relocations_[record.target].push_back(&record);
  }
}

void RecordWindow::Pop() {
  const FanRecord& record = Front();
  if (IsRelocation(record)) {
    const auto found = relocations_.find(record.target);
    found->second.pop_front();
    if (found->second.empty()) relocations_.erase(found);
  }
  --size_;
  if (++at_ < batches_.front().records.size()) return;
  batches_.pop_front();
  at_ = 0;
}

void RecordWindow::Clear() {
  relocations_.clear();
  batches_.clear();
  at_ = size_ = 0;
}

const FanRecord* RecordWindow::NextRelocation(const HandleKey& folder) const {
  const auto found = relocations_.find(folder);
  return found == relocations_.end() ? nullptr : found->second.front();
}

}  // namespace ferrox::notifyd
