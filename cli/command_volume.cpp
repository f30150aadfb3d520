#include <algorithm>
#include <set>

#include "cli/ask.h"
#include "cli/command_table.h"
#include "cli/configuration_change.h"
#include "cli/folder_path.h"
#include "cli/own_share.h"
#include "cli/share_remains.h"
#include "common/error.h"
#include "common/file_util.h"
#include "fileindex/folders/folder_mgr.h"
#include "fileindex/operations/index_mgr.h"
#include "platform/host/mounts.h"
#include "sdk/share.h"

/// A volume is named by its mount point. Any other folder is refused: below one that was given by mistake may lie more
/// than was meant, or nothing.
namespace ferrox::cli {

namespace {

using fileindex::FolderMgr;

constexpr char kRoot[] = "/";

/// Whether an entry of the list still waits for this volume.
bool WasPausedWith(const std::string& volume) {
  const FolderMgr configured;
  const auto& folders = configured.GetFolders();
  return std::any_of(folders.begin(), folders.end(),
                     [&](const auto& folder) { return folder->IsPaused() && folder->GetVolumeToBeClean() == volume; });
}

/// One that was paused may be gone by now.
std::string Volume(const std::string& word, const std::string& verb) {
  const std::string given = AbsolutePath(word);
  const std::string real = RealPath(given);
  const std::string volume = real.empty() ? given : real;
  if (kova::host::IsMountRoot(volume) == 1 || (verb != "pause" && WasPausedWith(volume))) return volume;
  if (!Exists(volume)) throw Failure(volume + " does not exist, and no folder was paused with it; give a mount point");
  const std::string mount_point = kova::host::MountPointOf(volume);
  throw Failure(volume + " is no mount point; it lies on the volume " + mount_point + ": 'fileindexctl volume " + verb +
                " " + mount_point + "' is for all of that, 'fileindexctl share " + verb + "' for one share");
}

/// The library finds the folders of a volume by "<mount point>/" at their beginning, which for "/" would be "//".
std::set<std::string> SharesOnRoot(bool paused) {
  const FolderMgr configured;
  std::set<std::string> shares;
  for (const auto& folder : configured.GetFolders()) {
    if (folder->IsPaused() != paused || !IsShare(folder->GetShare())) continue;
    if (kova::host::MountPointOf(folder->GetFullPath()) == kRoot) shares.insert(folder->GetShare());
  }
  return shares;
}

void ForEach(const std::set<std::string>& shares, void (*change)(const std::string& share)) {
  for (const std::string& share : shares) change(share);
}

}  // namespace

/// Reports each folder that has changed. "/" is no prefix in the library's sense, so that its shares are paused one by
/// one.
int RunVolumePause(const Arguments& arguments) {
  const std::string volume = Volume(arguments.words[0], "pause");
  RequireDaemons();
  return ChangeAndReport(
      [&] { volume == kRoot ? ForEach(SharesOnRoot(false), &fileindex::SharePause) : fileindex::VolumePause(volume); },
      "no indexed folder that is not paused lies on " + volume);
}

/// Folders that were paused otherwise, as single shares, go on as well: the library goes by where they lie.
int RunVolumeResume(const Arguments& arguments) {
  const std::string volume = Volume(arguments.words[0], "resume");
  RequireDaemons();
  return ChangeAndReport(
      [&] { volume == kRoot ? ForEach(SharesOnRoot(true), &fileindex::ShareResume) : fileindex::VolumeResume(volume); },
      "no paused folder lies on " + volume);
}

/// The operation itself leaves the indices, as if they had gone with the volume; on this host they lie elsewhere.
int RunVolumeForget(const Arguments& arguments) {
  const std::string volume = Volume(arguments.words[0], "forget");
  if (!WasPausedWith(volume)) {
    throw Failure("no folder was paused with the volume " + volume +
                  "; 'fileindexctl share forget' drops the index of a single share that is paused");
  }
  RequireEngine();
  const std::set<std::string> before = FolderMgr().GetIndexedShares();
  const int code = ChangeAndReport([&] { fileindex::VolumeClearPaused(volume); }, "");
  const std::set<std::string> after = FolderMgr().GetIndexedShares();
  for (const std::string& share : before) {
    if (after.count(share) == 0 && IsShare(share)) DropRemains(share, sdk::SDKShare(share).GetQueuePath());
  }
  return code;
}

}  // namespace ferrox::cli
