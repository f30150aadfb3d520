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

/// The status of folders, many at the cost of few: the status file and the folders file are loaded once, each share is
/// opened once, and its queue read once for all of its folders, each when it is first needed. What a folder is told, or
/// what is thrown for it, is what asking for it alone would give; a failure that concerns several is logged once.
/// Made per use, like the managers.
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
  struct Share {
    std::vector<const Folder*> folders;
    Memo<sdk::SDKShare> record;
    Memo<QueueScan> scan;
  };

  void Add(const Folder& folder);
  sdk::SDKShare& Open(Share& share, const std::string& name);
  bool IsIndexing(Share& share, const Folder& folder);

  std::unordered_map<std::string, Share> shares_;
  Memo<StatusMgr> status_mgr_;
  Memo<FolderMgr> folder_mgr_;
};

}  // namespace ferrox::fileindex
