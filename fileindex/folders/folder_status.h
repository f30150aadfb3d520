#pragma once

#include <memory>
#include <string>
#include <unordered_map>
#include <vector>

#include <json/forwards.h>

#include "fileindex/folders/memo.h"
#include "sdk/share.h"

namespace ferrox::fileindex {

class Folder;
class FolderMgr;
class QueueScan;
class StatusMgr;

/// The status of many folders at little more than the cost of one. Asking each folder alone would load both files,
/// open the share and read its queue every time; here the status file and the folders file are loaded once, each share
/// is opened once, and its queue read once for all of its folders, each when it is first needed. What is answered or
/// thrown for a folder is what asking it alone would give. A failure that concerns several folders is logged once and
/// thrown for each of them. Made per use, like the managers, and for one thread.
class FolderStatus {
 public:
  /// For the folders of a listing; they must outlive the object.
  explicit FolderStatus(const std::vector<std::shared_ptr<Folder>>& folders);
  explicit FolderStatus(const Folder& folder);
  FolderStatus(const FolderStatus&) = delete;
  FolderStatus& operator=(const FolderStatus&) = delete;
  ~FolderStatus();

  /// Folder::GetStatus and Folder::GetDataWithAdditional of one of the folders.
  void GetStatus(Json::Value& out, const Folder& folder);
  Json::Value GetDataWithAdditional(const Folder& folder, const Json::Value& additionals);

 private:
  /// What the folders of one share have in common.
  struct Share {
    std::vector<const Folder*> folders;  ///< those whose status may be asked for
    Memo<sdk::SDKShare> record;
    Memo<QueueScan> scan;  ///< which of them something in the queue touches
  };

  void Add(const Folder& folder);
  /// The share's record. @throws Error kNoSuchShare, every time.
  sdk::SDKShare& Open(Share& share, const std::string& name);
  /// Whether queued or running work touches the folder or something below it.
  bool IsIndexing(Share& share, const Folder& folder);

  std::unordered_map<std::string, Share> shares_;  ///< by name
  Memo<StatusMgr> status_mgr_;
  /// Never asked; reading a queue alone loads it, and fails when it cannot, so that this must fail alike.
  Memo<FolderMgr> folder_mgr_;
};

}  // namespace ferrox::fileindex
