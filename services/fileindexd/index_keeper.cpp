#define FERROX_SOURCE "share_worker"

#include "services/fileindexd/index_keeper.h"

#include <syslog.h>

#include <cinttypes>
#include <cstdint>

#include "common/error.h"
#include "common/lock_file.h"
#include "common/log.h"
#include "common/paths.h"
#include "fileindex/optree/optree.h"
#include "services/fileindexd/stray_documents.h"

namespace ferrox::indexd {

IndexKeeper::IndexKeeper(ShareContext& context)
    : context_(context),
      index_(context.environment.open_index(context.share)),
      note_(context.share, context.root, *index_, context.environment.describe_share) {}

void IndexKeeper::TellShare() {
  if (check_requested_) note_.Forget();
  note_.Tell();
}

void IndexKeeper::TryToTellShare() {
  try {
    TellShare();
  } catch (const Error&) {
    // Logged; a round, or the next wake, tries again.
  }
}

void IndexKeeper::EnsureExists(bool may_create) {
  if (exists_) return;
  if (!index_->Exists()) {
    FERROX_FAIL_IF(!may_create, Error::kEngineNoSuchIndex, "the share has no index yet");
    CreateMissing();
  }
  if (index_->List("", "", 1).empty()) context_.applied.Forget();
  CompareUnlessAccessIsRecorded();
  exists_ = true;
}

/// An index of before rights were recorded is compared once; no file is read for that.
void IndexKeeper::CompareUnlessAccessIsRecorded() {
  if (access_is_recorded_) return;
  const uint64_t without = index_->WithoutAccess();
  access_is_recorded_ = without == 0 || context_.queue.Add(fileindex::EVENT_REINDEX, context_.root);
  prepares_ = without != 0 && access_is_recorded_;
  if (without == 0) return;
  Log(LOG_NOTICE, "%" PRIu64 " documents of share %s do not say who may read their files; they are compared", without,
      context_.share.c_str());
}

/// The folders are loaded under their lock, so that no index is made for a share whose last folder is being removed. A
/// new index is empty: the reindex that fills it is queued before the index exists, so that a crash in between leaves
/// no empty index that looks complete.
void IndexKeeper::CreateMissing() {
  const LockFile lock(InstancePath(kFolderLockPath), true);
  FERROX_FAIL_IF(context_.folders.Load().Count() == 0, Error::kEngineNoSuchIndex, "the share is not indexed any more");
  if (index_->Exists()) return;
  Log(LOG_WARNING, "the index of share %s is gone; it is made anew", context_.share.c_str());
  (void)context_.queue.Add(fileindex::EVENT_REINDEX, context_.root);
  index_->Create();
}

void IndexKeeper::OnFailure(int code) {
  exists_ = exists_ && code != Error::kEngineNoSuchIndex;
  check_requested_ = true;
}

void IndexKeeper::ResumeUnlessFoldersPaused() {
  try {
    if (!context_.folders.Load().AnyPaused()) index_->Resume();
  } catch (const Error&) {
    // The pause is met again, and this tried again.
  }
}

void IndexKeeper::FollowRebuilding() {
  if (!check_requested_.exchange(false)) return;
  const int64_t before = rebuilding_.exchange(index_->Rebuilding());
  if (rebuilding_ == 0 || rebuilding_ == before) return;
  Log(LOG_WARNING, "the index of share %s was made anew; it is filled again", context_.share.c_str());
  context_.applied.Set(ShareFolders(), context_.applied.MountPoint());
  (void)context_.queue.Add(fileindex::EVENT_REINDEX, context_.root);
}

void IndexKeeper::FinishRebuilding() {
  if (rebuilding_ == 0 || context_.applied.Get().Count() == 0) return;
  if (!context_.folders.Load().DifferingFrom(context_.applied.Get()).empty()) return;
  index_->EndRebuilding(rebuilding_);
  rebuilding_ = 0;
  check_requested_ = true;  // another may have begun meanwhile
  context_.watch.Wake();
}

void IndexKeeper::FinishPreparing() {
  if (!prepares_) return;
  index_->EndPreparing();
  prepares_ = false;
}

bool IndexKeeper::HoldsStrays() {
  has_no_strays_ = has_no_strays_ || FindStray(*index_, context_.folders.Load().Topmost(context_.root)).empty();
  return !has_no_strays_;
}

bool IndexKeeper::ShowsUnknownRebuilding(const Json::Value& figures) const {
  return figures.isObject() && figures.isMember("rebuilding") &&
         figures["rebuilding"]["since"] != Json::Int64(rebuilding_);
}

}  // namespace ferrox::indexd
