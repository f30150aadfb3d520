#pragma once

#include <functional>
#include <string>

namespace ferrox::fileindex {
class FolderMgr;
}

namespace ferrox::cli {

/// Runs a management operation. When it fails, also says whether the list of indexed folders has been changed, and then
/// how to finish what follows from it. @throws Failure.
void ChangeConfiguration(const std::function<void()>& change);

/// Whether a folder of the share is paused.
bool IsPaused(const std::string& share);

/// @throws Failure when no folder of the share is indexed.
void RequireIndexed(const std::string& share, const fileindex::FolderMgr& configured);

}  // namespace ferrox::cli
