#include "services/fileindexd/disk_stage.h"

#include <fcntl.h>
#include <linux/capability.h>
#include <sys/stat.h>
#include <sys/syscall.h>
#include <unistd.h>

#include "base/path.h"
#include "base/unique_fd.h"
#include "services/fileindexd/file_presence.h"
#include "services/fileindexd/linked_documents.h"
#include "services/fileindexd/removal_batch.h"

namespace ferrox::indexd {

using Place = PathRules::Place;

namespace {

/// Whether this thread reads every folder whatever its permissions: then none becomes readable by a change of these.
bool MayReadAllFolders() {
  __user_cap_header_struct header = {_LINUX_CAPABILITY_VERSION_3, 0};
  __user_cap_data_struct sets[_LINUX_CAPABILITY_U32S_3] = {};
  return syscall(SYS_capget, &header, sets) == 0 && (sets[0].effective & (1U << CAP_DAC_READ_SEARCH)) != 0;
}

}  // namespace

struct DiskStage::Handler {
  fileindex::FileIndexOP op;
  void (DiskStage::*run)(const std::string& path, const std::string& old_path);
};

constexpr DiskStage::Handler DiskStage::kHandlers[] = {
    {fileindex::OP_DELETE, &DiskStage::Delete},
    {fileindex::OP_UPSERT, &DiskStage::Upsert},
    {fileindex::OP_ATTR, &DiskStage::Attr},
    {fileindex::OP_UPDATE_CFG, &DiskStage::UpdateCfg},
    {fileindex::OP_RENAME, &DiskStage::Rename},
    {fileindex::OP_REINDEX, &DiskStage::Reindex},
    {fileindex::OP_FULL_REINDEX, &DiskStage::FullReindex},
};

DiskStage::DiskStage(const PassContext& context, PathRules& rules, DocumentWriter& writer, PassCommits& commits)
    : context_(context),
      rules_(rules),
      writer_(writer),
      commits_(commits),
      reads_all_folders_(MayReadAllFolders()),
      tasks_(context.share.environment.pool, context.share.interruption),
      access_(tasks_, writer),
      comparer_(context, rules, writer, commits, tasks_, access_) {}

void DiskStage::CarryOut(fileindex::FileIndexOP op, const std::string& path, const std::string& old_path) {
  for (const Handler& handler : kHandlers) {
    if (handler.op == op) (this->*handler.run)(path, old_path);
  }
  FollowIgnoreFile(path);
  if (op == fileindex::OP_RENAME) FollowIgnoreFile(old_path);
}

/// What it says now holds for all below its folder. A folder's owner may have become that of the file in it.
void DiskStage::FollowIgnoreFile(const std::string& path) {
  if (base::NameOf(path) == services::kIgnoreFileName) comparer_.CompareOnce(std::string(base::ParentOf(path)));
}

/// What is there again is compared: of a file that a folder has replaced, the queue keeps the delete alone. A reindex
/// that came behind it is gone from the queue, too.
void DiskStage::Delete(const std::string& path, const std::string&) {
  struct stat status = {};
  if (PresenceOf(path, status) == Presence::kGone) return;
  had_reindex_ = true;
  comparer_.Compare(path);
}

void DiskStage::Upsert(const std::string& path, const std::string&) {
  if (path == context_.share.root) return;
  const bool wanted = rules_.CanBeIndexed(path);
  tasks_.Submit([this, path, wanted] { wanted ? writer_.Write(path) : writer_.Remove(path); });
}

void DiskStage::Attr(const std::string& path, const std::string&) {
  writer_.WillChange();  // so that the commit records the folders that have no documents: one of them may be meant
  if (path == context_.share.root) return;
  struct stat status = {};
  const bool is_folder = PresenceOf(path, status) == Presence::kThere && S_ISDIR(status.st_mode);
  const Place place = rules_.PlaceOf(path, is_folder);
  if (place == Place::kOutside) {
    tasks_.Submit([this, path] { writer_.Remove(path); });
  } else if (is_folder && (HasIgnoreFile(path) || (!reads_all_folders_ && BecameReadable(path)))) {
    comparer_.Compare(path);
  } else if (place == Place::kIndexed) {
    access_.Add(path);
  }
}

/// The kinds that the operation names are of no use: documents say which content they hold, so that only those differ
/// whose kind was switched, also after a change whose event was lost.
void DiskStage::UpdateCfg(const std::string& path, const std::string&) { comparer_.CompareOnce(path); }

/// Both places are compared with the disk. Of a file, all that a comparison would do at its new place is done by tasks
/// beside other files.
void DiskStage::Rename(const std::string& path, const std::string& old_path) {
  struct stat status = {};
  const bool wanted = path != context_.share.root && rules_.CanBeIndexed(path);
  const bool is_file = wanted && PresenceOf(path, status) == Presence::kThere && !S_ISDIR(status.st_mode);
  if (wanted) tasks_.Submit([this, path, old_path] { writer_.RefreshRenamed(path, old_path); });
  if (base::IsBelow(old_path, context_.share.root)) comparer_.CompareOnce(old_path);
  if (is_file) {
    tasks_.Submit([this, path] { writer_.RemoveBelow(path, context_.share.interruption); });
  } else {
    comparer_.CompareOnce(path);
  }
}

void DiskStage::Reindex(const std::string& path, const std::string&) {
  had_reindex_ = true;
  comparer_.CompareOnce(path);
}

void DiskStage::FullReindex(const std::string&, const std::string&) {
  had_reindex_ = true;
  comparer_.Compare(context_.share.root);
}

/// Then the folder's owner decides whether that file counts.
bool DiskStage::HasIgnoreFile(const std::string& folder) {
  struct stat status = {};
  return lstat((folder + "/" + services::kIgnoreFileName).c_str(), &status) == 0;
}

/// Whether this is a folder that can be read and of which the index knows no content: its permissions may just have
/// been opened. A request each, so not asked where that cannot be.
bool DiskStage::BecameReadable(const std::string& folder) const {
  const base::UniqueFd opened(open(folder.c_str(), O_RDONLY | O_DIRECTORY | O_NOFOLLOW | O_CLOEXEC));
  return opened.Valid() && context_.index.List(folder, "", 1).empty();
}

void DiskStage::RecheckEarlyWrites(const std::set<std::string>& early_writes) {
  RemovalBatch gone(tasks_, writer_, false);
  struct stat status = {};
  for (const std::string& path : early_writes) {
    if (PresenceOf(path, status) == Presence::kGone) gone.Add(path);
  }
  gone.Flush();
}

void DiskStage::RefreshLinked() {
  LinkedDocuments linked(context_, writer_, commits_, access_);
  linked.RefreshChangedFiles();
  linked.RefreshSuspects();
}

}  // namespace ferrox::indexd
