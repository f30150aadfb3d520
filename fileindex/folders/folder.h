#pragma once

#include <memory>
#include <string>

#include <json/value.h>

#include "common/export.h"

namespace ferrox::fileindex {

class FolderStatus;
struct FolderLookup;

/// One entry of the list of indexed folders: a folder that is chosen for indexing, and the kinds of files whose content
/// is indexed in it. Files of other kinds are always indexed by name and attributes. Paths are share paths
/// ("/photo/trip"). Held through std::shared_ptr. Not for several threads at once: share and full path are computed in
/// const members when they are first asked for.
class FERROX_EXPORT Folder {
 public:
  /// Takes the values as they are. Nothing is checked: neither that `path` begins with "/" nor that its share, or the
  /// folder, is there. `name` is what people call the folder.
  Folder(const std::string& path, const std::string& name, bool document, bool audio, bool video, bool photo,
         bool privileged, bool paused);
  /// Reads the stored form (docs/formats/folders.md). @throws Error kBadArgument for a required member that is missing
  /// or of another type, the first in the order of the format; optional ones of another type keep their defaults.
  explicit Folder(const Json::Value& data);

  /// The share path, as it was given.
  const std::string& GetPath() const { return path_; }
  /// What people call the folder; need not be unique.
  const std::string& GetName() const { return name_; }

  /// Whether the content of files of the kind is indexed; which file is of which kind, GetFileTypeByFullPath tells.
  bool IsDocument() const { return document_; }
  bool IsAudio() const { return audio_; }
  bool IsVideo() const { return video_; }
  bool IsPhoto() const { return photo_; }

  /// Kept for other programs; the library stores it and does not use it.
  bool IsPrivileged() const { return privileged_; }
  /// Whether indexing stands still for the folder, since its share or its volume was paused (SharePause, VolumePause).
  bool IsPaused() const { return paused_; }
  /// The mount point of the volume that the entry was paused with (VolumePause), "" for none. VolumeClearPaused finds
  /// the entries that it forgets by it; resuming leaves it as it is.
  const std::string& GetVolumeToBeClean() const { return volume_to_be_clean_; }

  /// The share's name, kept from the first call on. @throws Error kBadArgument when the path does not begin with "/".
  std::string GetShare() const;
  /// The absolute path, kept from the first call on. @throws Error kBadArgument; kNoSuchShare.
  std::string GetFullPath() const;

  /// Moves the entry to another share. Deliberate: a full path that was asked for before stays as it was; make a new
  /// Folder to learn the new one. @throws Error kBadArgument when the path has no share.
  void SetShare(const std::string& new_share);
  /// Replaces the path; share and full path are computed anew. Nothing is checked: neither that its share is there nor
  /// that no other entry has this path.
  void SetPath(const std::string& path);
  /// These two only change the entry: FolderMgr::Save stores it, and nothing is paused or cleaned by them alone.
  void SetPaused(bool paused) { paused_ = paused; }
  void SetVolumeToBeClean(const std::string& mount_point) { volume_to_be_clean_ = mount_point; }

  /// The stored form, every member present, as the constructor from JSON takes it back.
  Json::Value GetData() const;
  /// The four kinds alone: "document", "audio", "video", "photo".
  Json::Value GetIndexCfg() const;

  /// Whether queued or running work touches this folder or anything below it. @throws Error kNoSuchShare, kInternal,
  /// kLoadFailed, and kMalformedEvent or kBadArgument at a bad line of the queue.
  bool IsIndexing() const;
  /// Sets "text" of `out` to "error" (with "desc"), "need_reindex", "finished", "processing" or "paused".
  /// @throws Error as IsIndexing does.
  void GetStatus(Json::Value& out) const;
  /// GetData and, for each name in the array `additionals`, more below "additional"; "status" is the only name.
  /// @throws Error kBadArgument for anything else; as GetStatus.
  Json::Value GetDataWithAdditional(const Json::Value& additionals) const;

 private:
  // The two that know where shares lie, having asked once for many folders.
  friend class FolderStatus;
  friend struct FolderLookup;

  /// GetFullPath where it is known already what comes before the share path in it ("/volume1"): saves asking the
  /// platform for the share, which a lookup over many folders does once for each share.
  const std::string& FullPathBelow(const std::string& volume) const;

  std::string path_;
  std::string name_;
  std::string volume_to_be_clean_;
  bool document_ = false;
  bool audio_ = false;
  bool video_ = false;
  bool photo_ = false;
  bool privileged_ = false;
  bool paused_ = false;
  mutable std::string share_;      ///< "" until it is asked for
  mutable std::string full_path_;  ///< likewise
};

}  // namespace ferrox::fileindex
