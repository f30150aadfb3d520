#pragma once

#include <sys/types.h>

#include <optional>

/// Whom an instance belongs to, and what others must not see of it.
namespace ferrox::services {

/// The owner of the instance's root folder, "/" for the host's own. Nothing while there is no such folder, or it cannot
/// be looked at.
std::optional<uid_t> InstanceOwner();
/// Whether that is root: such an instance serves every user of the host, any other its owner alone. One whose folder is
/// still missing is the caller's.
bool IsRootsInstance();

/// An instance of root's serves users who must not learn which shares and folders there are beside those that they may
/// enter. So the folders that hold its settings and registrations are root's alone: made where they are missing, and
/// closed whatever they were before. The files in them keep their modes. Another user's instance, which serves that
/// user alone, stays as it is. What cannot be closed is logged. Does nothing in a process that is not root's.
void ClosePrivateFolders();

}  // namespace ferrox::services
