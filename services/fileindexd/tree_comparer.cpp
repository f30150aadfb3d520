#define FERROX_SOURCE "operation_runner"

#include "services/fileindexd/tree_comparer.h"

#include <cerrno>
#include <chrono>
#include <cstring>
#include <memory>

#include "base/path.h"
#include "common/error.h"
#include "common/log.h"
#include "services/fileindexd/file_count.h"
#include "services/fileindexd/file_presence.h"
#include "services/fileindexd/stray_documents.h"
#include "services/fileindexd/tree_walk.h"

namespace ferrox::indexd {

namespace {

using Place = PathRules::Place;

/// For a comparison that takes longer, the files are counted, so that its progress has an end to compare with.
constexpr auto kTimeBeforeCount = std::chrono::milliseconds(300);

}  // namespace

TreeComparer::TreeComparer(const PassContext& context, PathRules& rules, DocumentWriter& writer, PassCommits& commits,
                           TaskGroup& tasks, AccessBatch& access)
    : context_(context),
      rules_(rules),
      writer_(writer),
      commits_(commits),
      tasks_(tasks),
      access_(access),
      gone_(tasks, writer, false) {}

void TreeComparer::CompareOnce(const std::string& path) {
  if (IsTooLong(path) || compared_.HasAtOrAbove(path)) return;
  Compare(path);
  compared_.Insert(path, true);
}

void TreeComparer::Compare(const std::string& path) {
  if (path == context_.share.root) return CompareRoot();
  if (!base::IsBelow(path, context_.share.root)) return;
  const auto remove_tree = [&writer = writer_, &interruption = context_.share.interruption, path] {
    writer.RemoveTree(path, interruption);
  };
  if (context_.folders.PlaceOf(path) == Place::kOutside) return tasks_.Submit(remove_tree);
  struct stat status = {};
  const Presence presence = PresenceOf(path, status);
  if (presence == Presence::kUnknown) {
    return context_.share.status.AddFailure(std::string("cannot be examined: ") + strerror(errno), path);
  }
  const Place place = rules_.PlaceOf(path);
  if (presence == Presence::kGone || place == Place::kOutside) return tasks_.Submit(remove_tree);
  tasks_.Wait();
  CompareEntry(path, place, status);
  S_ISDIR(status.st_mode) ? CompareFolder(path) : writer_.RemoveBelow(path, context_.share.interruption);
}

void TreeComparer::CompareRoot() {
  tasks_.Wait();
  RemoveStrays();
  CompareFolder(context_.share.root);
}

/// After the share was renamed or moved, the documents that could not be moved with it have paths outside of its
/// folder.
void TreeComparer::RemoveStrays() {
  const std::string& root = context_.share.root;
  for (std::string stray; !(stray = FindStray(context_.index, {root})).empty();) {
    context_.share.interruption.Check();
    writer_.RemoveTree(TopOutside(stray, root), context_.share.interruption);
  }
}

void TreeComparer::CompareEntry(const std::string& path, Place place, const struct stat& status) {
  const auto indexed = context_.index.Find(path);
  if (place == Place::kOnTheWay) {
    if (!indexed.empty()) writer_.Remove(path);
  } else if (!indexed.empty() && writer_.IsCurrent(indexed.front(), status)) {
    return;
  } else if (!indexed.empty() && writer_.LacksAccessAlone(indexed.front(), status)) {
    access_.Add(path);
  } else {
    tasks_.Submit([&writer = writer_, path] { writer.Write(path); });
  }
}

void TreeComparer::CompareFolder(const std::string& folder) {
  WalkRules walk_rules;
  walk_rules.place_of = [this](const std::string& path) { return rules_.PlaceByPatterns(path, true); };
  walk_rules.exclusions_in = [this](const std::string& path, bool may_have_file) {
    return context_.exclusions.In(path, may_have_file);
  };
  walk_rules.skip_name = &PathRules::SkipName;
  walk_rules.may_enter = [this](const std::string& path, const struct stat& status, dev_t device) {
    return rules_.MayEnter(path, status, device);
  };
  walk_rules.on_problem = [this](const std::string& path, int error) {
    context_.share.status.AddFailure(std::string("cannot be read: ") + strerror(error), path);
  };
  TreeWalk walk(folder, walk_rules);
  FERROX_FAIL_IF(!walk.Opened() && folder == context_.share.root, Error::kInternal,
                 "the share's folder cannot be read");
  context_.held.CheckStillThere();

  tasks_.SetUrgent(false);
  context_.share.status.BeginComparison(folder);
  CompareBelow(folder, walk, context_.index, Actions(folder));
  gone_.Flush();
  access_.Finish();
  context_.share.status.LinksSkipped(walk.LinksSkipped());
  context_.share.status.EndComparison();
}

ComparisonActions TreeComparer::Actions(const std::string& folder) {
  ComparisonActions actions;
  ShareStatus& status = context_.share.status;
  actions.is_current = [this, &status](const IndexedEntry& indexed, const struct stat& file) {
    const bool is_current = writer_.IsCurrent(indexed, file);
    const bool lacks_access = !is_current && writer_.LacksAccessAlone(indexed, file);
    if (lacks_access) access_.Add(indexed.path);
    if (is_current || lacks_access) status.FileExamined();
    return is_current || lacks_access;
  };
  actions.wants_content = [this](const std::string& path, const struct stat& file) {
    return writer_.WantsContent(path, file);
  };
  actions.is_worth_another_try = &DocumentWriter::IsWorthAnotherTry;
  actions.are_current = [&status](uint64_t documents) { status.FileExamined(documents); };
  actions.write = [this, &status](const std::string& path, const struct stat&) {
    tasks_.Submit([&writer = writer_, &status, path] {
      writer.Write(path);
      status.FileExamined();
    });
  };
  actions.remove = [this](const std::string& path) { gone_.Add(path); };
  const auto count = std::make_shared<std::unique_ptr<FileCount>>();
  const auto count_at = std::chrono::steady_clock::now() + kTimeBeforeCount;
  actions.examine = [this, &status, folder, count, count_at] {
    context_.share.interruption.Check();
    if (*count == nullptr && std::chrono::steady_clock::now() >= count_at)
      *count = std::make_unique<FileCount>(folder, context_.folders, context_.exclusions, status);
    commits_.CommitIfDue();
  };
  return actions;
}

}  // namespace ferrox::indexd
