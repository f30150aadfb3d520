#pragma once

#include <sys/fanotify.h>
#include <sys/types.h>

#include <array>
#include <cstdint>
#include <memory>
#include <string>
#include <string_view>
#include <vector>

#include "base/unique_fd.h"

namespace ferrox::notifyd {

/// What a file system knows a folder or file by, wherever it is moved to: bytes that are compared, hashed and stored
/// and have no further meaning outside of FanGroup. "" is none. Those of ext4, xfs and tmpfs need no memory of their
/// own.
using HandleKey = std::string;

/// One record of the kernel. The names live as long as the batch; a folder's change of its own has its own key as
/// `folder` and the name ".".
struct FanRecord {
  uint64_t mask = 0;  ///< FAN_CREATE and so on; several, when the kernel has joined changes of the same name and object
  int32_t pid = 0;    ///< 0 without the capability CAP_SYS_ADMIN
  HandleKey folder = {};  ///< where `name` is; of a rename, the old place, "" when that one is not marked
  std::string_view name = {};
  HandleKey new_folder = {};  ///< of a rename, the new place, "" when that one is not marked
  std::string_view new_name = {};
  HandleKey target = {};  ///< what the name names or named

  bool IsFolder() const { return (mask & FAN_ONDIR) != 0; }
  /// The kernel dropped records, here.
  bool IsOverflow() const { return (mask & FAN_Q_OVERFLOW) != 0; }
};

/// Records in the order in which the kernel queued them, and the memory that their names are in.
struct FanBatch {
  std::unique_ptr<char[]> bytes = {};
  std::vector<FanRecord> records = {};
};

/// A notification group of the kernel whose records tell names by the folder that they are in, and folders by handles.
/// Belongs to one thread.
class FanGroup {
 public:
  enum class Scope : uint8_t { kFolder, kFileSystem };

  FanGroup() = default;

  /// Opens the group, non-blocking; "" or why there is none, without a full stop and with the remedy.
  std::string Open();
  bool IsOpen() const { return fd_.Valid(); }
  /// Readable when there are records.
  int Fd() const { return fd_.Get(); }

  /// Marks a folder, or the whole file system that it is on. Masks of the same folder add up.
  /// @return 0 or an errno, which Reason explains.
  int Mark(const std::string& path, Scope scope, uint64_t mask);
  /// The same for an open folder; also one that was opened with O_PATH.
  int Mark(int folder, Scope scope, uint64_t mask);
  /// Takes `mask` away; 0 or an errno.
  int Unmark(const std::string& path, Scope scope, uint64_t mask);
  int Unmark(int folder, Scope scope, uint64_t mask);
  /// No more records of these kinds for a folder's names, whatever else is marked, while the kernel has the folder in
  /// memory. 0 or an errno; EINVAL before Linux 6.0.
  int Ignore(int folder, uint64_t mask);
  /// Why marking failed, a sentence without a full stop.
  static std::string Reason(int error, Scope scope);

  /// Reads one batch, some thousand records at most; its records take the place of those in `batch`.
  /// @return 0, EAGAIN when there is nothing, or another errno.
  int Read(FanBatch& batch);

  /// The key of an open folder or file as records carry it, or "" with errno set.
  HandleKey KeyOf(int fd);
  /// The same, when it is on the file system of `sibling`; a little cheaper.
  HandleKey KeyOf(int fd, const HandleKey& sibling);
  /// How many bytes of a key's handle are before the file's number, and how many the number has, both 0 when that is
  /// not known: each kind of file system has its own form.
  struct NumberPlace {
    uint8_t at = 0;
    uint8_t size = 0;
  };
  /// Found by the key of something whose number is known.
  static NumberPlace FindNumber(const HandleKey& key, uint64_t number);
  /// The number in the key's handle; 0 when it has none there.
  static uint64_t NumberIn(const HandleKey& key, NumberPlace place);
  /// Keys with the same form have it in the same place.
  static std::string FormOf(const HandleKey& key);

  /// Whether both are of one file system.
  static bool IsSameFileSystem(const HandleKey& a, const HandleKey& b);
  /// Opens what the key stands for; `mount` is any folder open on its file system. Not valid with errno set, ESTALE
  /// when it is removed. Needs CAP_DAC_READ_SEARCH.
  static base::UniqueFd OpenKey(const HandleKey& key, int mount, int flags);

  /// Reads the records in a kernel's answer, as far as they are whole. For Read and tests.
  void Parse(const char* bytes, size_t size, std::vector<FanRecord>& records);

 private:
  using FileSystemId = std::array<char, 8>;

  int ChangeMark(unsigned flags, int at, const char* path, uint64_t mask);
  HandleKey EncodeKey(size_t file_system, const char* handle, size_t size) const;
  size_t Number(const FileSystemId& id);
  bool ParseInfo(const char* info, size_t size, FanRecord& record);

  base::UniqueFd fd_;
  std::unique_ptr<char[]> buffer_;
  std::vector<FileSystemId> file_systems_;
  size_t last_number_ = 0;
};

}  // namespace ferrox::notifyd
