#pragma once

#include <functional>
#include <string>
#include <vector>

namespace ferrox::fileindex {
class FolderMgr;
}

namespace ferrox::cli {

/// Runs a management operation. When it fails, also says whether the list of indexed folders has been changed, and then
/// how to finish what follows from it. @throws Failure.
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
