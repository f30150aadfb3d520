#include "services/kovanotifyd/filesystem/rename_history.h"

#include <string_view>
#include <utility>

namespace ferrox::notifyd {

namespace {

/// A place as one string: the length of the folder's key in one byte, the key, the name.
std::string Encode(const HandleKey& folder, std::string_view name) {
  std::string place(1, static_cast<char>(folder.size()));
  return place.append(folder).append(name);
}

FolderPlace Decode(const std::string& place) {
  const auto key_size = static_cast<unsigned char>(place[0]);
  return {place.substr(1, key_size), place.substr(1U + key_size)};
}

}  // namespace

void RenameHistory::Note(const FanRecord& record) {
  if (record.target.empty()) return;
  std::string left = Encode(record.folder, record.name);
  if ((record.mask & FAN_RENAME) != 0) {
    std::string place = Encode(record.new_folder, record.new_name);
    if (WasAt(record.target, place)) {
      looping_.insert(record.target);
      NoteLeft(record.target, std::move(place));
    }
  } else if (record.IsFolder()) {
    return;  // a folder that was removed does not come back
  }
  NoteLeft(record.target, std::move(left));
}

void RenameHistory::NoteName(const HandleKey& target) {
  names_.set(std::hash<HandleKey>()(target) % kNameBits);
  has_names_ = true;
}

bool RenameHistory::HasLeft(const HandleKey& target) const {
  return left_.count(target) != 0 || left_before_.count(target) != 0;
}

void RenameHistory::NoteLeft(const HandleKey& target, std::string place) {
  if (noted_++ >= kGenerationMax) {
    left_before_ = std::exchange(left_, {});
    noted_ = 1;
  }
  left_[target].insert(std::move(place));
}

bool RenameHistory::WasAt(const HandleKey& target, const std::string& place) const {
  for (const auto* left : {&left_, &left_before_}) {
    const auto found = left->find(target);
    if (found != left->end() && found->second.count(place) != 0) return true;
  }
  return false;
}

std::unordered_map<HandleKey, std::vector<FolderPlace>> RenameHistory::Loops() const {
  std::unordered_map<HandleKey, std::vector<FolderPlace>> loops;
  for (const HandleKey& target : looping_) {
    for (const auto* left : {&left_, &left_before_}) {
      const auto found = left->find(target);
      if (found == left->end()) continue;
      for (const std::string& place : found->second) loops[target].push_back(Decode(place));
    }
  }
  return loops;
}

void RenameHistory::Clear() {
  left_ = {};
  left_before_ = {};
  looping_ = {};
  noted_ = 0;
  if (std::exchange(has_names_, false)) names_.reset();
}

}  // namespace ferrox::notifyd
