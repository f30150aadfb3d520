#pragma once

#include <cstddef>
#include <deque>
#include <list>
#include <unordered_map>

#include "services/kovanotifyd/fan_group.h"

namespace ferrox::notifyd {

/// The records that were read and not yet worked through, in their order, and which folders they move or remove.
class RecordWindow {
 public:
  RecordWindow() = default;
  RecordWindow(const RecordWindow&) = delete;
  RecordWindow& operator=(const RecordWindow&) = delete;

  /// Adds records behind the others.
  void Add(FanBatch batch);
  bool IsEmpty() const { return size_ == 0; }
  size_t Size() const { return size_; }
  /// The first record; stays where it is until Pop, whatever is added.
  const FanRecord& Front() const { return batches_.front().records[at_]; }
  void Pop();
  void Clear();

  /// The first record that moves the folder away from a place or removes it from there, which is where it is until
  /// then; null without.
  const FanRecord* NextRelocation(const HandleKey& folder) const;

 private:
  static bool IsRelocation(const FanRecord& record);

  std::deque<FanBatch> batches_;
  size_t at_ = 0;
  size_t size_ = 0;
  std::unordered_map<HandleKey, std::list<const FanRecord*>> relocations_;
};

}  // namespace ferrox::notifyd
