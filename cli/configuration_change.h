#pragma once

#include <functional>
#include <string>
#include <vector>

namespace ferrox::fileindex {
class FolderMgr;
}

/// What the commands that change what is indexed have in common.
namespace ferrox::cli {

/// Runs a management operation (fileindex/operations/index_mgr.h). When it fails, says what was not done, whether the
/// list of indexed folders has been changed, and then how to finish what follows from it: the list is compared with
/// what it was before, since an operation may fail before or after it saves. @throws Failure.
void ChangeConfiguration(const std::function<void()>& change);

/// Runs one and tells what has become of which folders, or `nothing`. @return the exit code. @throws Failure.
int ChangeAndReport(const std::function<void()>& change, const std::string& nothing);

/// Whether a folder of the share is paused.
bool IsPaused(const std::string& share);

/// A reindex that is being carried out may have passed by what has changed since, yet the library takes it for one that
/// is still to come and queues no other. Then the share is marked, and the daemon reindexes it when it has finished.
/// @return whether the daemon is at work on the share's queue. @throws Error kNoSuchShare; as StatusMgr does.
bool MarkIfBusy(const std::string& share);

/// @throws Failure when no folder of the share is indexed.
void RequireIndexed(const std::string& share, const fileindex::FolderMgr& configured);

/// The name of a share that is there. @throws Error kNoSuchShare; Failure when no folder of it is indexed.
std::string IndexedShare(const std::string& name);

/// The shares of these names; without names, all that have an indexed folder.
/// @throws Failure when no folder of one is indexed; Error kNoSuchShare.
std::vector<std::string> IndexedShares(const std::vector<std::string>& names);

}  // namespace ferrox::cli
