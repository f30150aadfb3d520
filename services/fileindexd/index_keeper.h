#pragma once

#include <atomic>
#include <chrono>
#include <cstdint>
#include <memory>

#include <json/value.h>

#include "services/fileindexd/share_context.h"
#include "services/fileindexd/share_index.h"

namespace ferrox::indexd {

/// Sees that a share's index exists, is filled again when the engine had to make it anew, and holds no documents that
/// no folder wants. What is to be indexed for that is queued; passes carry it out. Belongs to the worker's thread but
/// for the calls that say otherwise.
class IndexKeeper {
 public:
  explicit IndexKeeper(ShareContext& context);

  /// Safe for several threads.
  ShareIndex& Index() { return *index_; }

  /// Returns when the index exists. Management operations make and remove indices with the folders; a lost one is made
  /// here, when `may_create`: one that has just gone missing may be about to be renamed to this name, or to be gone for
  /// good, with its last folder. @throws Error kEngineNoSuchIndex, and as the engine does.
  void EnsureExists(bool may_create);
  /// After a failed round: what was known of the index may not hold any more.
  void OnFailure(int code);
  /// Tells the engine which share the index is of. @throws Error as the engine does.
  void TellShare();
  /// The same for a worker that does no rounds now; what the engine cannot be told is left for the next time.
  void TryToTellShare();
  /// Adds to the share's status who may not search it. From any thread.
  void AddNoteTo(Json::Value& status) const { note_.AddTo(status); }

  /// Ends a pause of the index that no folder of the share is paused for: the paused ones were removed, or the
  /// operation that paused it was not finished. A failure is left for the next time.
  void ResumeUnlessFoldersPaused();

  /// Has the next round ask whether the engine has made the index anew. From any thread.
  void RequestCheck() { check_requested_ = true; }
  bool IsCheckRequested() const { return check_requested_; }
  /// Does that check when it was requested. A new rebuilding begins with no folders applied and a queued reindex; what
  /// the index got before this process began is found in it and not read again.
  void FollowRebuilding();
  /// Tells the engine that a rebuilding is complete, once a pass has brought the index in line with the folders.
  void FinishRebuilding();
  /// Tells the engine that the comparison has ended that gives an index of an earlier version its records of rights.
  void FinishPreparing();

  /// Whether the index that this worker took over holds documents that no folder wants, those of before the share was
  /// renamed or moved for example. Not asked again once there are none.
  bool HoldsStrays();
  /// The same, as far as is known without asking the index.
  bool MayHoldStrays() const { return !has_no_strays_; }

  /// The engine's figures of the index (ShareIndex::Figures); blocks at most for `longest`. From any thread.
  Json::Value Figures(std::chrono::milliseconds longest) { return index_->Figures(longest); }
  /// Whether figures tell of a rebuilding that has not been met. From any thread.
  bool ShowsUnknownRebuilding(const Json::Value& figures) const;

 private:
  void CreateMissing();
  void CompareUnlessAccessIsRecorded();

  ShareContext& context_;
  const std::unique_ptr<ShareIndex> index_;
  ShareNote note_;
  bool exists_ = false;
  bool access_is_recorded_ = false;  ///< or a comparison that does it is queued
  bool prepares_ = false;            ///< that comparison is queued or under way
  bool has_no_strays_ = false;
  std::atomic<bool> check_requested_{true};
  std::atomic<int64_t> rebuilding_{0};  ///< the one under way, as ShareIndex tells it; 0: none
};

}  // namespace ferrox::indexd
