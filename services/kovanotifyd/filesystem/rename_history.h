#pragma once

#include <bitset>
#include <cstddef>
#include <functional>
#include <string>
#include <unordered_map>
#include <unordered_set>
#include <vector>

#include "services/kovanotifyd/filesystem/folder_locator.h"

namespace ferrox::notifyd {

/// Finds what the kernel may have kept to itself. A record that is the same as one that is still queued is joined with
/// that one, and so takes its place: of "a to b, b to a, a to b" two records come, and the last one told is not the
/// last one done. That takes a file or folder to come back to a place that it had left while records were waiting. All
/// its places of that time are then in doubt.
class RenameHistory {
 public:
  /// Whether a name of the file was noted: a name that it is found to have now may be missing from the records.
  bool HasLeft(const HandleKey& target) const;
  /// Notes that a record told of a name of the file. A link made there later may be joined with it.
  void NoteName(const HandleKey& target);
  /// Whether a name of the file may have been noted.
  bool MayHaveName(const HandleKey& target) const { return names_[std::hash<HandleKey>()(target) % kNameBits]; }
  /// Notes a record that renames or removes a name.
  void Note(const FanRecord& record);
  bool HasLoops() const { return !looping_.empty(); }
  /// The files and folders that are in doubt, each with its places.
  std::unordered_map<HandleKey, std::vector<FolderPlace>> Loops() const;
  /// Nothing is waiting in the kernel: what was noted cannot be joined with anything any more.
  void Clear();

 private:
  using Places = std::unordered_set<std::string>;

  /// As many records can wait in the kernel, unless fs.fanotify.max_queued_events says otherwise.
  static constexpr size_t kGenerationMax = 16384;

  /// Eight a record: what is noted is known for certain, what is not is mostly not taken for it.
  static constexpr size_t kNameBits = 8 * kGenerationMax;

  bool WasAt(const HandleKey& target, const std::string& place) const;
  void NoteLeft(const HandleKey& target, std::string place);

  std::unordered_map<HandleKey, Places> left_;
  std::unordered_map<HandleKey, Places> left_before_;
  size_t noted_ = 0;
  std::unordered_set<HandleKey> looping_;
  std::bitset<kNameBits> names_;
  bool has_names_ = false;
};

}  // namespace ferrox::notifyd
