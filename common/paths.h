#pragma once

#include <string>

#include "common/export.h"

namespace ferrox {

/// Where a fixed absolute path of the product lies in this instance: the path itself, or below the instance's root
/// (FERROX_ROOT, kova/instance.h). The root is read once in the life of a process. The path is put together as text;
/// nothing is made or looked for on disk.
///   const ferrox::LockFile lock(ferrox::InstancePath(ferrox::kFolderLockPath), true);
FERROX_EXPORT std::string InstancePath(const char* fixed_path);

/// The longest path that a Unix-domain socket can have, in bytes without the terminating zero. A longer root makes an
/// instance unusable.
constexpr size_t kSocketPathMaxBytes = 107;

/// Why this instance's root cannot be used: a sentence with the remedy. Empty when it can. A root must be absolute, and
/// so short that the longest of the sockets' paths below still fits. Programs ask this when they start, since a socket
/// that cannot be bound later explains nothing.
FERROX_EXPORT std::string InstanceRootProblem();

/// The daemons' sockets (docs/formats/daemon.md). All of these paths go through InstancePath.
inline constexpr char kFileIndexdSocket[] = "/var/run/fileindexd.sock";
inline constexpr char kElasticdSocket[] = "/var/run/kovaelasticd.sock";
/// Where the engine's own user has its runtime files, and the socket that the path above is then a link to. No longer
/// than that path.
inline constexpr char kElasticdRunFolder[] = "/var/run/kovaelasticd";
inline constexpr char kElasticdOwnSocket[] = "/var/run/kovaelasticd/sock";
inline constexpr char kNotifydSocket[] = "/var/run/kovanotifyd.sock";
inline constexpr char kAccessSocket[] = "/var/run/kova-access.sock";
inline constexpr char kContentExtractdSocket[] = "/var/run/kovacontentextractd.sock";
/// The engine's list of indices. Whose it is, is the engine's user (services/support/engine_user.h).
inline constexpr char kElasticdFolder[] = "/var/lib/kova/kovaelasticd";
/// The indexed folders and the states of indexing; each is written under its lock file below.
inline constexpr char kConfigurationFolder[] = "/var/packages/Ferrox/etc";
inline constexpr char kFileIndexFoldersCfgPath[] = "/var/packages/Ferrox/etc/fileindex.folders";
/// Which files are left out of indexed folders; beside the folders, under the lock of these.
inline constexpr char kFileIndexExclusionsCfgPath[] = "/var/packages/Ferrox/etc/fileindex.exclusions";
inline constexpr char kFileIndexStatusCfgPath[] = "/var/packages/Ferrox/etc/fileindex.status";
inline constexpr char kFolderLockPath[] = "/tmp/ferrox_cfg_folder.lock";
inline constexpr char kStatusLockPath[] = "/tmp/ferrox_cfg_fi_status.lock";

}  // namespace ferrox
