#pragma once

#include <cstddef>
#include <deque>
#include <list>
#include <unordered_map>

#include "services/kovanotifyd/fan_group.h"

namespace ferrox::notifyd {

/// The records that were read and are not yet worked on, in their order, with an index of those that move or remove
/// folders.
class RecordWindow {
 public:
  RecordWindow() = default;
  RecordWindow(const RecordWindow&) = delete;
  RecordWindow& operator=(const RecordWindow&) = delete;

  /// Appends records.
  void Add(FanBatch batch);
  bool IsEmpty() const { return size_ == 0; }
  size_t Size() const { return size_; }
  /// The first record. The reference is valid until Pop or Clear, whatever is added.
  const FanRecord& Front() const { return batches_.front().records[at_]; }
  /// Drops the first record, and the memory of its batch with the last one of it.
  void Pop();
  void Clear();

  /// The first record that moves or removes the folder, whose old place is where the folder is until then; null when
  /// there is none.
  const FanRecord* NextRelocation(const HandleKey& folder) const;

 private:
  static bool IsRelocation(const FanRecord& record);

  std::deque<FanBatch> batches_;  ///< none of them empty
  size_t at_ = 0;                 ///< the first record's index in the first batch
  size_t size_ = 0;               ///< records in all batches from there on
  std::unordered_map<HandleKey, std::list<const FanRecord*>> relocations_;  ///< by folder, in order
};

}  // namespace ferrox::notifyd
