// Any bytes as the folders file: there is a list, or the file cannot be loaded (504) or holds what is no folder (120).
// A list answers every question, and loads again as it was saved.

#include <stdlib.h>

#include <filesystem>
#include <iostream>
#include <memory>
#include <string>

#include <json/value.h>

#include "common/file_util.h"
#include "common/log.h"
#include "common/paths.h"
#include "fileindex/folders/folder_mgr.h"
#include "fuzz/memory_folder.h"
#include "tests/support/fake_platform.h"

using ferrox::Error;
using ferrox::fileindex::FolderMgr;

namespace {

/// An instance with one share, for the life of the process.
class Instance {
 public:
  Instance() {
    root_ = ferrox::test::MakeMemoryFolder("fuzz_folders");
    (void)setenv("FERROX_ROOT", root_.c_str(), 1);
    std::filesystem::create_directories(ferrox::InstancePath(ferrox::kConfigurationFolder));
    (void)ferrox::SetLogSink([](int, const char*) {});
    ferrox::test::FakePlatform::Get().Reset();
    ferrox::test::FakePlatform::Get().shares["photo"].path = "/v/photo";
  }
  ~Instance() { std::filesystem::remove_all(root_); }

 private:
  std::string root_;
};

Json::Value DataOf(const FolderMgr& mgr) {
  Json::Value data(Json::arrayValue);
  for (const auto& folder : mgr.GetFolders()) data.append(folder->GetData());
  return data;
}

void Check(bool holds, const char* claim) {
  if (holds) return;
  std::cerr << "not so: " << claim << "\n";
  abort();
}

void Use(FolderMgr& mgr) {
  const Json::Value data = DataOf(mgr);
  mgr.Save();
  Check(DataOf(FolderMgr()) == data, "it loads as it was saved");
  for (const auto& folder : mgr.GetFolders()) {
    const std::string full_path = "/v" + folder->GetPath();
    Check(
        mgr.IsFullPathIndexed(full_path) || folder->GetPath().rfind("/photo", 0) != 0 || folder->GetShare() != "photo",
        "a folder of a share is indexed");
    (void)mgr.IsFullPathNeedMeta(full_path);
  }
  for (const std::string& share : mgr.GetIndexedShares()) {
    Check(mgr.IsShareIndexed(share), "shares with folders are indexed");
    mgr.DeleteByShare(share);
  }
  std::shared_ptr<ferrox::fileindex::Folder> change;
  while (!mgr.GetFolders().empty()) mgr.Delete(change, std::string(mgr.GetFolders()[0]->GetPath()));
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size) {
  static const Instance instance;
  const std::string path = ferrox::InstancePath(ferrox::kFileIndexFoldersCfgPath);
  Check(ferrox::WriteWholeFile(path, {reinterpret_cast<const char*>(data), size}), "the file can be written");
  std::unique_ptr<FolderMgr> mgr;
  try {
    mgr = std::make_unique<FolderMgr>();
  } catch (const Error& error) {
    Check(error.Code() == Error::kLoadFailed || error.Code() == Error::kBadArgument, "504 or 120");
    return 0;
  }
  Use(*mgr);
  return 0;
}
