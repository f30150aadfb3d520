#include "services/fileindexd/move_stage.h"

#include <sys/stat.h>

#include <cstddef>
#include <utility>

#include "services/fileindexd/file_presence.h"
#include "services/fileindexd/stray_documents.h"

namespace ferrox::indexd {

namespace {

/// So many folders, and places that hold documents, are searched for what has moved; with more, files are read again.
constexpr size_t kSearchedMax = 100;
/// The index is asked of the first removed paths of a pass, up to this many, whether they were folders.
constexpr int kAskedMax = 20;
/// So many paths may be under way at once; bounds memory.
constexpr size_t kUnderWayMax = 10000;

}  // namespace

MoveStage::MoveStage(const PassContext& context, PathRules& rules, DocumentWriter& writer)
    : context_(context),
      mover_(context.share.root, context.index, context.folders, rules, writer, context.share.interruption),
      tasks_(context.share.environment.pool, context.share.interruption),
      gone_trees_(tasks_, writer, true) {}

void MoveStage::CarryOut(fileindex::FileIndexOP op, const std::string& path, const std::string& old_path) {
  if (op == fileindex::OP_DELETE) Delete(path);
  if (op == fileindex::OP_RENAME) Rename(path, old_path);
}

void MoveStage::Delete(const std::string& path) {
  struct stat status = {};
  if (PresenceOf(path, status) != Presence::kGone) return;
  BeginOn({path});
  // To ask costs a round trip. Behind kAskedMax there are folders among them, or the commit is a small part of the
  // pass.
  removed_folder_ = removed_folder_ || ++removed_ > kAskedMax || !context_.index.List(path, "", 1).empty();
  gone_trees_.Add(path);
}

void MoveStage::Rename(const std::string& path, const std::string& old_path) {
  BeginOn({path, old_path});
  for (const DocumentMover::Step& step : mover_.StepsOf(path, old_path)) {
    tasks_.Submit([this, step] { mover_.Move(step); });
  }
}

/// What concerns other paths than all that is under way may be done beside it; else the queue's order counts.
void MoveStage::BeginOn(const std::vector<std::string>& paths) {
  bool free = under_way_.Count() < kUnderWayMax;
  for (const std::string& path : paths) free = free && !under_way_.Overlaps(path);
  if (!free) Finish();
  for (const std::string& path : paths) under_way_.Add(path);
}

void MoveStage::Finish() {
  gone_trees_.Flush();
  tasks_.Wait();
  under_way_.Clear();
}

/// A renamed folder differs twice: under its new path it is configured and there, and under its old one neither. The
/// old path's document says which file it was of.
void MoveStage::MoveRenamedFolders(const std::vector<std::string>& differing) {
  std::vector<std::pair<std::string, struct stat>> there;
  std::vector<std::string> others;
  for (const std::string& folder : differing) {
    struct stat status = {};
    if (context_.folders.PlaceOf(folder) != ShareFolders::Place::kIndexed) {
      others.push_back(folder);
    } else if (PresenceOf(folder, status) == Presence::kThere) {
      there.emplace_back(folder, status);
    }
  }
  if (there.size() > kSearchedMax || others.size() > kSearchedMax) return;
  for (const std::string& other : others) {
    for (const auto& [folder, status] : there) {
      if (mover_.DescribesFile(other, status)) Rename(folder, other);
    }
  }
  Finish();
}

/// A share that was renamed or moved is watched at its new place by the first daemon that finds it there, and so
/// compared, perhaps before the event of the move is queued, or instead of it: without this, every file would be read
/// again then.
bool MoveStage::MoveStrays() {
  const std::string& root = context_.share.root;
  std::vector<std::string> seen = {root};
  bool any = false;
  for (std::string stray; seen.size() < kSearchedMax && !(stray = FindStray(context_.index, seen)).empty();) {
    seen.push_back(TopOutside(stray, root));
    const std::string before = mover_.RootBeforeMove(seen.back());
    if (before.empty()) continue;
    Rename(root, before);
    Finish();
    any = true;
  }
  return any;
}

}  // namespace ferrox::indexd
