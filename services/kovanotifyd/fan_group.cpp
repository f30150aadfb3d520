#include "services/kovanotifyd/fan_group.h"

#include <fcntl.h>
#include <sys/statfs.h>
#include <syslog.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <cstring>

#include "common/log.h"

namespace ferrox::notifyd {

namespace {

constexpr size_t kBufferBytes = 256U << 10;
// A handle begins with the number of its own bytes and their type, 4 bytes each.
constexpr size_t kHandleHeader = 8;
constexpr unsigned kMarkFolder = FAN_MARK_ONLYDIR | FAN_MARK_DONT_FOLLOW;
// AT_HANDLE_FID, newer than the headers of some hosts: a handle as in records, also where the file system cannot open
// it.
constexpr int kHandleFid = 0x200;

unsigned Flags(FanGroup::Scope scope) {
  return kMarkFolder | (scope == FanGroup::Scope::kFileSystem ? FAN_MARK_FILESYSTEM : FAN_MARK_INODE);
}

template <typename T>
T Load(const char* at) {
  T value;
  std::memcpy(&value, at, sizeof value);
  return value;
}

std::string OpenReason(int error) {
  if (error == ENOSYS) return "this kernel has no fanotify; Linux 5.17 or newer is needed";
  if (error == EINVAL) return "this kernel's fanotify does not tell names; Linux 5.17 or newer is needed";
  if (error == EPERM) return "fanotify is not permitted here; run as root or allow the system call fanotify_init";
  if (error == EMFILE) return "too many fanotify groups or open files; raise fs.fanotify.max_user_groups";
  return "fanotify cannot be opened: " + std::string(strerror(error));
}

/// How many bytes of the key the file system's number takes (EncodeKey).
size_t NumberLength(const HandleKey& key) { return (static_cast<unsigned char>(key[0]) & 0x80U) != 0 ? 2 : 1; }

/// Room for a handle as name_to_handle_at and open_by_handle_at take it.
struct HandleBuffer {
  alignas(file_handle) char bytes[sizeof(file_handle) + MAX_HANDLE_SZ] = {};
  file_handle* Get() { return reinterpret_cast<file_handle*>(bytes); }
};

/// Asks again for one that cannot be opened where the file system has no other. False with errno set.
bool GetHandle(int fd, HandleBuffer& buffer) {
  int mount_id = 0;
  buffer.Get()->handle_bytes = MAX_HANDLE_SZ;
  if (name_to_handle_at(fd, "", buffer.Get(), &mount_id, AT_EMPTY_PATH) == 0) return true;
  if (errno != EOPNOTSUPP) return false;
  buffer.Get()->handle_bytes = MAX_HANDLE_SZ;
  return name_to_handle_at(fd, "", buffer.Get(), &mount_id, AT_EMPTY_PATH | kHandleFid) == 0;
}

}  // namespace

std::string FanGroup::Open() {
  constexpr unsigned kFlags =
      FAN_CLASS_NOTIF | FAN_REPORT_DFID_NAME | FAN_REPORT_FID | FAN_REPORT_TARGET_FID | FAN_CLOEXEC | FAN_NONBLOCK;
  fd_.Reset(fanotify_init(kFlags, O_RDONLY | O_LARGEFILE | O_CLOEXEC));
  return fd_.Valid() ? "" : OpenReason(errno);
}

int FanGroup::ChangeMark(unsigned flags, int at, const char* path, uint64_t mask) {
  return fanotify_mark(fd_.Get(), flags, mask, at, path) == 0 ? 0 : errno;
}

int FanGroup::Mark(const std::string& path, Scope scope, uint64_t mask) {
  return ChangeMark(FAN_MARK_ADD | Flags(scope), AT_FDCWD, path.c_str(), mask);
}

int FanGroup::Mark(int folder, Scope scope, uint64_t mask) {
  return ChangeMark(FAN_MARK_ADD | Flags(scope), folder, ".", mask);
}

int FanGroup::Unmark(const std::string& path, Scope scope, uint64_t mask) {
  return ChangeMark(FAN_MARK_REMOVE | Flags(scope), AT_FDCWD, path.c_str(), mask);
}

int FanGroup::Unmark(int folder, Scope scope, uint64_t mask) {
  return ChangeMark(FAN_MARK_REMOVE | Flags(scope), folder, ".", mask);
}

int FanGroup::Ignore(int folder, uint64_t mask) {
  return ChangeMark(FAN_MARK_ADD | FAN_MARK_IGNORE_SURV | FAN_MARK_EVICTABLE | kMarkFolder, folder, ".",
                    mask | FAN_EVENT_ON_CHILD);
}

std::string FanGroup::Reason(int error, Scope scope) {
  const bool whole = scope == Scope::kFileSystem;
  if (error == EPERM && whole) return "marking a whole file system needs the capability CAP_SYS_ADMIN";
  if (error == ENODEV) return "the file system has no number of its own, which fanotify needs";
  if (error == EXDEV && whole) return "it is a part of a file system, such as a subvolume, that cannot be marked alone";
  if (error == EXDEV) return "the file system's number is not unique, which fanotify needs";
  if (error == EOPNOTSUPP) return "the file system has no file handles, which fanotify needs";
  if (error == ENOSPC) return "the limit of fanotify marks is reached; raise fs.fanotify.max_user_marks";
  return "fanotify cannot mark it: " + std::string(strerror(error));
}

int FanGroup::Read(FanBatch& batch) {
  batch.records.clear();
  if (!buffer_) buffer_.reset(new char[kBufferBytes]);  // not cleared: only what is used is in memory
  ssize_t size = 0;
  do {
    size = read(fd_.Get(), buffer_.get(), kBufferBytes);
  } while (size < 0 && errno == EINTR);
  if (size < 0) return errno;
  if (size == 0) return EAGAIN;
  batch.bytes.reset(new char[static_cast<size_t>(size)]);
  std::memcpy(batch.bytes.get(), buffer_.get(), static_cast<size_t>(size));
  Parse(batch.bytes.get(), static_cast<size_t>(size), batch.records);
  return 0;
}

void FanGroup::Parse(const char* bytes, size_t size, std::vector<FanRecord>& records) {
  while (size >= sizeof(fanotify_event_metadata)) {
    const auto event = Load<fanotify_event_metadata>(bytes);
    if (event.event_len < event.metadata_len || event.event_len > size || event.vers != FANOTIFY_METADATA_VERSION ||
        event.metadata_len < sizeof event) {
      Log(LOG_WARNING, "fanotify record of %u bytes cannot be read", event.event_len);
      return;
    }
    FanRecord& record = records.emplace_back();
    record.mask = event.mask;
    record.pid = event.pid;
    size_t at = event.metadata_len;
    while (at + sizeof(fanotify_event_info_header) <= event.event_len) {
      const auto header = Load<fanotify_event_info_header>(bytes + at);
      if (header.len < sizeof header || header.len > event.event_len - at) break;
      if (!ParseInfo(bytes + at, header.len, record)) break;
      at += header.len;
    }
    bytes += event.event_len;
    size -= event.event_len;
  }
}

/// Reads one info of a record: a handle, with a name behind it in some. False when its lengths contradict each other.
bool FanGroup::ParseInfo(const char* info, size_t size, FanRecord& record) {
  const uint8_t type = Load<fanotify_event_info_header>(info).info_type;
  const bool is_old = type == FAN_EVENT_INFO_TYPE_DFID_NAME || type == FAN_EVENT_INFO_TYPE_DFID ||
                      type == FAN_EVENT_INFO_TYPE_OLD_DFID_NAME;
  const bool is_new = type == FAN_EVENT_INFO_TYPE_NEW_DFID_NAME;
  if (!is_old && !is_new && type != FAN_EVENT_INFO_TYPE_FID) return true;

  constexpr size_t kIdAt = sizeof(fanotify_event_info_header);
  constexpr size_t kHandleAt = kIdAt + sizeof(FileSystemId);
  if (size < kHandleAt + kHandleHeader) return false;
  const auto handle_bytes = Load<uint32_t>(info + kHandleAt);
  const size_t name_at = kHandleAt + kHandleHeader + handle_bytes;
  if (handle_bytes > MAX_HANDLE_SZ || name_at > size) return false;

  HandleKey key = EncodeKey(Number(Load<FileSystemId>(info + kIdAt)), info + kHandleAt, handle_bytes);
  const std::string_view name(info + name_at, strnlen(info + name_at, size - name_at));
  if (is_new) {
    record.new_folder = std::move(key);
    record.new_name = name;
  } else if (is_old) {
    record.folder = std::move(key);
    record.name = name;
  } else {
    record.target = std::move(key);
  }
  return true;
}

/// The file system's number in this group, which keys have instead of the kernel's 8 bytes.
size_t FanGroup::Number(const FileSystemId& id) {
  if (last_number_ < file_systems_.size() && file_systems_[last_number_] == id) return last_number_;
  const auto found = std::find(file_systems_.begin(), file_systems_.end(), id);
  last_number_ = static_cast<size_t>(found - file_systems_.begin());
  if (found == file_systems_.end()) file_systems_.push_back(id);
  return last_number_;
}

/// A key is the file system's number (1 byte below 0x80, else 2 with the highest bit set), the handle's type (1 byte)
/// and the handle's bytes. `handle` is the length, the type and the bytes. "" for numbers and types beyond that form.
HandleKey FanGroup::EncodeKey(size_t file_system, const char* handle, size_t size) const {
  const auto type = Load<int32_t>(handle + sizeof(uint32_t));
  if (file_system >= 0x8000U || type < 0 || type > 0xFF) return {};
  char text[3 + MAX_HANDLE_SZ];
  size_t length = 0;
  if (file_system >= 0x80U) text[length++] = static_cast<char>(0x80U | (file_system >> 8U));
  text[length++] = static_cast<char>(file_system & 0xFFU);
  text[length++] = static_cast<char>(type);
  std::memcpy(text + length, handle + kHandleHeader, size);
  return HandleKey(text, length + size);
}

HandleKey FanGroup::KeyOf(int fd) {
  struct statfs figures = {};
  HandleBuffer buffer;
  if (fstatfs(fd, &figures) != 0 || !GetHandle(fd, buffer)) return {};
  static_assert(sizeof figures.f_fsid == sizeof(FileSystemId));
  return EncodeKey(Number(Load<FileSystemId>(reinterpret_cast<const char*>(&figures.f_fsid))), buffer.bytes,
                   buffer.Get()->handle_bytes);
}

HandleKey FanGroup::KeyOf(int fd, const HandleKey& sibling) {
  HandleBuffer buffer;
  if (sibling.empty() || !GetHandle(fd, buffer)) return {};
  const auto first = static_cast<unsigned char>(sibling[0]);
  const size_t number =
      NumberLength(sibling) == 1 ? first : (first & 0x7FU) << 8U | static_cast<unsigned char>(sibling[1]);
  return EncodeKey(number, buffer.bytes, buffer.Get()->handle_bytes);
}

/// Tries where nearly all file systems have it, 8 bytes first: the first 4 of these are often the number too.
FanGroup::NumberPlace FanGroup::FindNumber(const HandleKey& key, uint64_t number) {
  for (const NumberPlace place : {NumberPlace{0, 8}, NumberPlace{4, 8}, NumberPlace{0, 4}}) {
    if (number != 0 && NumberIn(key, place) == number) return place;
  }
  return {};
}

uint64_t FanGroup::NumberIn(const HandleKey& key, NumberPlace place) {
  const size_t begin = key.empty() ? 0 : NumberLength(key) + 1 + place.at;
  if (key.empty() || place.size == 0 || begin + place.size > key.size()) return 0;
  return place.size == 4 ? Load<uint32_t>(key.data() + begin) : Load<uint64_t>(key.data() + begin);
}

std::string FanGroup::FormOf(const HandleKey& key) {
  return key.empty() ? std::string() : key.substr(0, NumberLength(key) + 1) + std::to_string(key.size());
}

bool FanGroup::IsSameFileSystem(const HandleKey& a, const HandleKey& b) {
  return !a.empty() && !b.empty() && a.compare(0, NumberLength(a), b, 0, NumberLength(b)) == 0;
}

base::UniqueFd FanGroup::OpenKey(const HandleKey& key, int mount, int flags) {
  const size_t type_at = key.empty() ? 0 : NumberLength(key);
  if (key.size() < type_at + 1 || key.size() - type_at - 1 > MAX_HANDLE_SZ) {
    errno = EINVAL;
    return base::UniqueFd();
  }
  HandleBuffer buffer;
  buffer.Get()->handle_bytes = static_cast<unsigned>(key.size() - type_at - 1);
  buffer.Get()->handle_type = static_cast<unsigned char>(key[type_at]);
  std::memcpy(buffer.bytes + kHandleHeader, key.data() + type_at + 1, key.size() - type_at - 1);
  return base::UniqueFd(open_by_handle_at(mount, buffer.Get(), flags | O_CLOEXEC));
}

}  // namespace ferrox::notifyd
