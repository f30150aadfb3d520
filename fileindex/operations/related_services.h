#pragma once

#include <string>

/// What the management operations switch, register, remove and tell outside the configuration.
namespace ferrox::fileindex {

class FolderMgr;

/// Whether the platform knows the share. @throws Error kNoSuchShare when it cannot tell.
bool IsShareKnown(const std::string& share);

/// Switches what indexing needs on or off: Spotlight in the file-sharing service, content extraction, the index daemon.
/// Each is tried whatever became of the ones before; a failure is logged only.
void SetupRelatedServices(bool enable);

/// Has the notification daemon watch exactly the folders that `folder_mgr` has of the share.
/// @throws Error kNoSuchShare; kInternal "MonitorQueue::Upsert failed, share=...".
void UpsertKOVANotifydCfg(const std::string& share, const FolderMgr& folder_mgr);
/// Has it watch nothing of the share any more.
/// @throws Error kNoSuchShare; kInternal "MonitorQueue::Delete failed, share=...".
void DeleteKOVANotifydCfg(const std::string& share);

/// Removes the queues, the index database and the status bits of the share whose absolute folder is `share_path`.
/// @throws Error kInternal when the platform cannot tell where they are, the queues first; as StatusMgr does.
void CleanShareIndexData(const std::string& share, const std::string& share_path);

/// elastic::ShareIndexCreate for a share that had no folders. An index of that name at another place is left from
/// before its volume was forgotten.
void CreateShareIndex(const std::string& share);
/// elastic::ShareIndexDelete for a share that may have no index any more: an operation that was interrupted behind
/// this step can be asked for again.
void DeleteShareIndex(const std::string& share);

/// Commands to the index daemon: what of the share is indexed has changed; begin to work on the share; stop it.
/// @throws Error kInternal as SendCommandToDaemon does.
void NotifySettingChanged(const std::string& share, bool is_upsert);
void CreateWorker(const std::string& share);
void DeleteWorker(const std::string& share);

}  // namespace ferrox::fileindex
