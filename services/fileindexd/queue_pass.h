#pragma once

#include <set>
#include <string>

#include "fileindex/queue/queue_mgr.h"
#include "services/fileindexd/index_keeper.h"
#include "services/fileindexd/share_availability.h"
#include "services/fileindexd/share_context.h"
#include "services/fileindexd/share_folders.h"
#include "services/fileindexd/share_place.h"

namespace ferrox::indexd {

class OperationRunner;

/// One pass: detaches a share's queue, has its operations carried out (OperationRunner), and deletes it once all of it
/// is durable in the index. A pass that ends by an exception leaves the detached queue where it is; the next pass takes
/// it up again from its beginning. Made for one pass, by the worker's thread.
class QueuePass {
 public:
  /// All outlive it. `early_writes` are the files that an earlier pass wrote before their lines' turn; the pass
  /// rechecks them and leaves its own.
  QueuePass(ShareContext& context, IndexKeeper& keeper, ShareAvailability& availability,
            std::set<std::string>& early_writes);

  /// @return whether there was a queue. @throws Interrupted; Error when the pass is to be tried again.
  bool Run();

 private:
  bool Detach();
  void CarryOut(OperationRunner& runner, const ShareFolders& folders, bool whole_share);
  void AwaitOtherFolders(const ShareFolders& folders);
  void MarkIfFoldersChanged(const OperationRunner& runner, const ShareFolders& folders);

  ShareContext& context_;
  IndexKeeper& keeper_;
  ShareAvailability& availability_;
  std::set<std::string>& early_writes_;
  const HeldFolder held_;  ///< the share's folder, so that its volume stays where it is
  const std::string mount_point_;
  fileindex::QueueMgr queue_;
};

}  // namespace ferrox::indexd
