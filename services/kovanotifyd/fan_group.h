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

/// The file handle of a folder or file with a number for its file system: stays the same wherever it is moved. Outside
/// of FanGroup the bytes have no meaning; they are compared, hashed and stored. "" is none. Those of ext4, xfs and
/// tmpfs are so short that the string needs no memory of its own.
using HandleKey = std::string;

/// One record of the kernel. The names are valid as long as the batch. A change of a folder itself, rather than of a
/// name in it, has that folder as `folder` and the name ".".
struct FanRecord {
  uint64_t mask = 0;      ///< FAN_CREATE and so on; several bits when the kernel joined changes of one name and object
  int32_t pid = 0;        ///< 0 without the capability CAP_SYS_ADMIN
  HandleKey folder = {};  ///< that has `name`; of a rename, the old folder, "" when that one is not marked
  std::string_view name = {};
  HandleKey new_folder = {};  ///< of a rename, the new folder, "" when that one is not marked
  std::string_view new_name = {};
  HandleKey target = {};  ///< the file or folder that has, or had, the name

  bool IsFolder() const { return (mask & FAN_ONDIR) != 0; }
  /// Whether the kernel dropped records at this point of the order.
  bool IsOverflow() const { return (mask & FAN_Q_OVERFLOW) != 0; }
};

/// Records in the order in which the kernel queued them, with the memory that their names point into.
struct FanBatch {
  std::unique_ptr<char[]> bytes = {};
  std::vector<FanRecord> records = {};
};

/// A fanotify group of the kernel, whose records name what changed by the handle of its folder and its name there, and
/// of the encoding of these handles as keys. Belongs to one thread.
class FanGroup {
 public:
  enum class Scope : uint8_t { kFolder, kFileSystem };

  FanGroup() = default;

  /// Opens the group for reading that does not block. @return "", or why that fails, with the remedy and without a full
  /// stop.
  std::string Open();
  bool IsOpen() const { return fd_.Valid(); }
  /// Readable when there are records.
  int Fd() const { return fd_.Get(); }

  /// Marks a folder, or the whole file system that it is on: the kinds of changes in `mask` are reported from then on,
  /// beside those that it was marked for before.
  /// @return 0 or an errno, which Reason explains.
  int Mark(const std::string& path, Scope scope, uint64_t mask);
  /// The same for an open folder; also one that was opened with O_PATH.
  int Mark(int folder, Scope scope, uint64_t mask);
  /// Takes `mask` away; 0 or an errno.
  int Unmark(const std::string& path, Scope scope, uint64_t mask);
  int Unmark(int folder, Scope scope, uint64_t mask);
  /// Leaves out records of these kinds for names in a folder, whatever else is marked, until the kernel drops the
  /// folder from memory. 0 or an errno; EINVAL before Linux 6.0.
  int Ignore(int folder, uint64_t mask);
  /// Why marking failed with that errno: a sentence without a full stop.
  static std::string Reason(int error, Scope scope);

  /// Reads one batch, some thousand records at most, in place of what `batch` has.
  /// @return 0, EAGAIN when there is nothing, or another errno.
  int Read(FanBatch& batch);

  /// The key of an open folder or file, equal to that in its records; "" with errno set when there is none.
  HandleKey KeyOf(int fd);
  /// The same for something on the file system of `sibling`; a system call cheaper.
  HandleKey KeyOf(int fd, const HandleKey& sibling);
  /// Where in a handle its file's inode number is: file systems differ in that. Both 0 when it is not known.
  struct NumberPlace {
    uint8_t at = 0;    ///< bytes of the handle before it
    uint8_t size = 0;  ///< its own bytes
  };
  /// Finds the place in the key of a file whose number is known.
  static NumberPlace FindNumber(const HandleKey& key, uint64_t number);
  /// The number at that place; 0 when the key has none there.
  static uint64_t NumberIn(const HandleKey& key, NumberPlace place);
  /// A text that is the same for keys that have the number in the same place: file system, handle's type and length.
  static std::string FormOf(const HandleKey& key);

  /// Whether both keys are of one file system.
  static bool IsSameFileSystem(const HandleKey& a, const HandleKey& b);
  /// Opens the file or folder of a key; `mount` is any open folder on its file system. Not valid with errno set when
  /// that fails; ESTALE when it was removed. Needs CAP_DAC_READ_SEARCH.
  static base::UniqueFd OpenKey(const HandleKey& key, int mount, int flags);

  /// Appends the records in the kernel's answer, as far as they are whole, to `records`. For Read and tests.
  void Parse(const char* bytes, size_t size, std::vector<FanRecord>& records);

 private:
  using FileSystemId = std::array<char, 8>;

  int ChangeMark(unsigned flags, int at, const char* path, uint64_t mask);
  HandleKey EncodeKey(size_t file_system, const char* handle, size_t size) const;
  size_t Number(const FileSystemId& id);
  bool ParseInfo(const char* info, size_t size, FanRecord& record);

  base::UniqueFd fd_;
  std::unique_ptr<char[]> buffer_;
  std::vector<FileSystemId> file_systems_;  ///< by the number that keys have in their place
  size_t last_number_ = 0;                  ///< that was looked up: mostly the next one too
};

}  // namespace ferrox::notifyd
