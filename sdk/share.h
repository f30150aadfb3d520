#pragma once

#include <cstdint>
#include <memory>
#include <string>
#include <vector>

#include "common/export.h"

struct KOVAShare;

namespace ferrox::sdk {

/// One shared folder as the platform knows it. Made per use: the record is read once and is not renewed, the questions
/// below are asked anew each time and may block for the disk. Every platform call is made under SDKMutex() unless a
/// function says otherwise, and so are the record's making and freeing: the caller must not hold that mutex, not even
/// where the object ends.
///   const ferrox::sdk::SDKShare share("photo");
///   if (share.CanBeIndexed() && share.IsSpaceEnough()) Index(share.GetPath(), share.GetDBPath());
class FERROX_EXPORT SDKShare {
 public:
  /// @throws Error kNoSuchShare, with the name, when there is no such share, and when the host's table of shares cannot
  /// be read.
  explicit SDKShare(const std::string& share_name);
  SDKShare(const SDKShare&) = delete;
  SDKShare& operator=(const SDKShare&) = delete;
  ~SDKShare();

  /// The name that it was looked up by. Lives as long as the object.
  const std::string& GetName() const { return share_name_; }
  /// The share's absolute folder, for example "/volume1/photo", as it was when the record was read. Asks nobody.
  std::string GetPath() const;

  /// The share's index id, database folder and event queue file, as the platform composes them (kova/file_index.h). The
  /// folder that holds the database folders, or the queues, is made when it is missing; neither the database nor the
  /// queue itself need be there.
  /// @throws Error kInternal "<platform call> failed, share=<name>".
  std::string GetDBName() const;
  std::string GetDBPath() const;
  std::string GetQueuePath() const;

  /// Whether deletions over the network go to a recycle bin, and whether the share is an encrypted one, locked or not.
  /// True only for a platform value of exactly 1. @throws Error kInternal.
  bool IsEnableRecycleBin() const;
  bool IsEncryption() const;
  /// Whether the share is neither locked (encrypted) nor read-only; both are always asked. @throws Error kInternal.
  bool CanBeIndexed() const;
  /// Whether 100 MiB more fit on the share's volume. Deliberate: a query that fails for any reason but lack of space
  /// counts as enough, so that it cannot stop indexing.
  bool IsSpaceEnough() const;
  /// Whether files that a user may not read are hidden from that user. False when the query fails. Made without the
  /// mutex, like GetPrivilege.
  bool IsHideUnReadable() const;
  /// The platform's privilege value of `user` on this share (KOVA_PRIV_*), as it is; below 0 when it cannot be asked.
  int GetPrivilege(const std::string& user) const;
  /// From the record: 0 none, 1 read only, 2 read and write.
  uint32_t GetFTPPrivilege() const;

  /// The names of all shares, encrypted ones included, in the platform's order. @throws Error kShareEnumFailed.
  static std::vector<std::string> Enum();

 private:
  /// Frees the record as it was made: by the platform.
  struct RecordFree {
    void operator()(KOVAShare* record) const;
  };

  std::unique_ptr<KOVAShare, RecordFree> share_info_;  ///< never null after construction
  std::string share_name_;
};

}  // namespace ferrox::sdk
