#include "fileindex/folders/folder.h"

#include "common/json_util.h"
#include "fileindex/folders/folder_rule.h"
#include "fileindex/folders/folder_status.h"
#include "fileindex/queue/queue_mgr.h"
#include "fileindex/util.h"
#include "sdk/share.h"

namespace ferrox::fileindex {

Folder::Folder(const std::string& path, const std::string& name, bool document, bool audio, bool video, bool photo,
               bool privileged, bool paused)
    : path_(path),
      name_(name),
      document_(document),
      audio_(audio),
      video_(video),
      photo_(photo),
      privileged_(privileged),
      paused_(paused) {}

Folder::Folder(const Json::Value& data) {
  GetJsonValue(path_, data, "path", true);
  GetJsonValue(name_, data, "name", true);
  GetJsonValue(document_, data, "document", true);
  GetJsonValue(audio_, data, "audio", true);
  GetJsonValue(video_, data, "video", true);
  GetJsonValue(photo_, data, "photo", true);
  GetJsonValue(privileged_, data, "privileged", false);
  GetJsonValue(paused_, data, "paused", false);
  GetJsonValue(volume_to_be_clean_, data, "volume_to_be_clean", false);
}

std::string Folder::GetShare() const {
  if (share_.empty()) GetShareNameByPath(share_, path_);
  return share_;
}

std::string Folder::GetFullPath() const {
  if (full_path_.empty()) fileindex::GetFullPath(full_path_, path_);
  return full_path_;
}

const std::string& Folder::FullPathBelow(const std::string& volume) const {
  if (full_path_.empty()) full_path_ = volume + path_;
  return full_path_;
}

void Folder::SetShare(const std::string& new_share) {
  path_ = ReplacePathShare(path_, new_share, GetShare());
  share_ = new_share;
}

void Folder::SetPath(const std::string& path) {
  path_ = path;
  share_.clear();
  full_path_.clear();
}

Json::Value Folder::GetData() const {
  Json::Value data = GetIndexCfg();
  data["path"] = path_;
  data["name"] = name_;
  data["paused"] = paused_;
  data["privileged"] = privileged_;
  data["volume_to_be_clean"] = volume_to_be_clean_;
  return data;
}

Json::Value Folder::GetIndexCfg() const {
  Json::Value stored(Json::objectValue);
  const ContentKinds kinds = KindsOf(*this);
  for (size_t i = 0; i < kinds.size(); ++i) stored[kContentKindNames[i]] = kinds[i];
  return stored;
}

bool Folder::IsIndexing() const {
  const sdk::SDKShare share(GetShare());
  return QueueMgr(share.GetQueuePath()).IsFullPathProcessing(GetFullPath());
}

void Folder::GetStatus(Json::Value& out) const { FolderStatus(*this).GetStatus(out, *this); }

Json::Value Folder::GetDataWithAdditional(const Json::Value& additionals) const {
  return FolderStatus(*this).GetDataWithAdditional(*this, additionals);
}

}  // namespace ferrox::fileindex
