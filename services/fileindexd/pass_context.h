#pragma once

#include <cstdint>
#include <functional>
#include <set>
#include <string>

#include "services/fileindexd/share_context.h"
#include "services/fileindexd/share_folders.h"
#include "services/fileindexd/share_index.h"
#include "services/fileindexd/share_place.h"
#include "services/support/exclusions.h"

namespace ferrox::indexd {

/// What one pass over a share's queue works with; all of it outlives the pass.
struct PassContext {
  ShareContext& share;
  const ShareFolders& folders;  ///< as they were when the queue was detached
  services::Exclusions& exclusions;
  ShareIndex& index;
  const HeldFolder& held;  ///< the share's folder
  /// Inode numbers of files that changed under names that say nothing of the share's own names of them.
  const std::set<uint64_t>& changed_files;
  /// Whether the index may hold documents of an earlier place of the share.
  bool may_hold_strays;
  /// Returns when the folders stay as they are although a change of them is to be expected. @throws Interrupted when
  /// they have changed, so that the pass begins anew.
  std::function<void()> await_folders;
  /// Files that passes wrote before their lines' turn (ChangeFollower). A pass rechecks those of the pass before and
  /// leaves its own; the worker keeps them.
  std::set<std::string>& early_writes;
};

}  // namespace ferrox::indexd
