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

/// Finds names of which the kernel may have left out records. It joins a record with an equal one that is still queued:
/// of the renames "a to b, b to a, a to b" it reports two, and the last one that is reported is not the last one that
/// was done. That takes a file or folder to come back to a place that it had left while records were waiting; all
/// places that it had in that time are then in doubt.
class RenameHistory {
 public:
  /// Whether the file left a name (Note): the record of a name that it has now may have been left out.
  bool HasLeft(const HandleKey& target) const;
  /// Notes that the file has a record of a name. A later record of a link that is made there may be joined with that
  /// one.
  void NoteName(const HandleKey& target);
  /// Whether NoteName may have been called for the file: false only if it was not.
  bool MayHaveName(const HandleKey& target) const { return names_[std::hash<HandleKey>()(target) % kNameBits]; }
  /// Notes a record that renames or removes a name.
  void Note(const FanRecord& record);
  bool HasLoops() const { return !looping_.empty(); }
  /// The files and folders that came back, each with the places that are in doubt.
  std::unordered_map<HandleKey, std::vector<FolderPlace>> Loops() const;
  /// To be called when no records are waiting, since nothing can be joined with what was noted any more.
  void Clear();

 private:
  using Places = std::unordered_set<std::string>;

  /// How many records can wait in the kernel, unless fs.fanotify.max_queued_events was changed.
  static constexpr size_t kGenerationMax = 16384;

  /// A Bloom filter with one hash: eight bits for each record keep false positives few.
  static constexpr size_t kNameBits = 8 * kGenerationMax;

  bool WasAt(const HandleKey& target, const std::string& place) const;
  void NoteLeft(const HandleKey& target, std::string place);

  // Places that files and folders have left, in two generations: when the newer one is full it replaces the older.
  std::unordered_map<HandleKey, Places> left_;
  std::unordered_map<HandleKey, Places> left_before_;
  size_t noted_ = 0;  ///< in the newer generation
  std::unordered_set<HandleKey> looping_;
  std::bitset<kNameBits> names_;
  bool has_names_ = false;
};

}  // namespace ferrox::notifyd
