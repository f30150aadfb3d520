#include "services/kovanotifyd/folders/inspection_queue.h"

#include <utility>

namespace ferrox::notifyd {

void InspectionQueue::AddNameInDoubt(Id parent, std::string_view name) {
  in_doubt_.push_back({tree_.RefOf(parent), std::string(name)});
}

void InspectionQueue::NoteMoved(Id id) {
  tree_.Set(id, FolderTree::kMoved, true);
  moved_.push_back(tree_.RefOf(id));
}

/// The tree now shows the disk as it was when the folders were inspected. One that was moved since then, alone or with
/// a folder above it, was inspected at a path that may have been another folder's.
void InspectionQueue::OnAllRead() {
  for (const Ref ref : std::exchange(inspected_, {})) {
    const Id id = tree_.Get(ref);
    if (id != FolderTree::kNone && tree_.HasAtOrAbove(id, FolderTree::kMoved)) folders_.push_back({ref, false});
  }
  for (const Ref ref : std::exchange(moved_, {})) {
    const Id id = tree_.Get(ref);
    if (id != FolderTree::kNone) tree_.Set(id, FolderTree::kMoved, false);
  }
  for (Name& name : std::exchange(in_doubt_, {})) names_.push_back(std::move(name));
  if (cookie_ == Cookie::kAfterAllRead) cookie_ = Cookie::kAfterInspections;
}

std::optional<InspectionQueue::Folder> InspectionQueue::TakeFolder() {
  if (folders_.empty()) return {};
  const Folder folder = folders_.back();
  folders_.pop_back();
  return folder;
}

InspectionQueue::Name InspectionQueue::TakeName() {
  Name name = std::move(names_.back());
  names_.pop_back();
  return name;
}

bool InspectionQueue::TakeCookie() {
  if (cookie_ != Cookie::kAfterInspections) return false;
  cookie_ = Cookie::kNone;
  return true;
}

void RootWalks::Start(const std::string& root, Ref folder) {
  Cancel(root);
  walks_.push_back({root, {folder}});
}

void RootWalks::Cancel(const std::string& root) {
  std::erase_if(walks_, [&root](const Walk& walk) { return walk.root == root; });
}

std::optional<FolderTree::Ref> RootWalks::TakeFolder() {
  std::vector<Ref>& ahead = walks_.front().ahead;
  if (ahead.empty()) return {};
  const Ref next = ahead.back();
  ahead.pop_back();
  return next;
}

void RootWalks::AddFolders(const std::string& root, const std::vector<Ref>& folders) {
  if (walks_.empty() || walks_.front().root != root) return;
  std::vector<Ref>& ahead = walks_.front().ahead;
  ahead.insert(ahead.end(), folders.begin(), folders.end());
}

}  // namespace ferrox::notifyd
