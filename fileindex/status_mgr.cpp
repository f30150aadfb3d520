#include "fileindex/status_mgr.h"

#include <sys/stat.h>

#include <cerrno>
#include <cstdint>

#include "common/clock.h"
#include "common/communication.h"
#include "common/file_util.h"
#include "common/json_util.h"
#include "common/lock_file.h"
#include "common/log.h"
#include "common/paths.h"
#include "sdk/credentials.h"

namespace ferrox::fileindex {

namespace {

constexpr char kResumeTime[] = "resume_time";
constexpr char kShare[] = "share";
constexpr long long kNotPaused = -1;

std::string StatusPath() { return InstancePath(kFileIndexStatusCfgPath); }
std::string StatusLockPath() { return InstancePath(kStatusLockPath); }

/// Whether the file held a status document; members that are absent count as empty.
bool ReadStatus(Json::Value& data, const std::string& path) {
  return fromFile(data, path) && IsJsonObject(data) && IsJsonObject(data.get(kShare, Json::Value()));
}

/// The moment `hours` from now, 0 for none.
/// Deliberate: counted in 32 bits, as the readers of the file expect it; a very long pause wraps.
long long DeadlineAfter(int hours) {
  if (hours == 0) return 0;
  const uint32_t deadline = static_cast<uint32_t>(Clock::Get().Now()) + 3600U * static_cast<uint32_t>(hours);
  return static_cast<int32_t>(deadline);
}

/// The share's bits as a number without a sign, for masking; 0 when it has none, or no number.
unsigned int OldBits(const Json::Value& data, const std::string& share) {
  Json::Value shares;
  unsigned int bits = 0;
  GetJsonValue(shares, data, kShare, false);
  GetJsonValue(bits, shares, share, false);
  return bits;
}

}  // namespace

StatusMgr::StatusMgr() {
  const std::string path = StatusPath();
  FERROX_FAIL_IF_AS(IsFileExist(path) && !ReadStatus(data_, path),
                    "IsFileExist(kFileIndexStatusCfgPath) && !data_.fromFile(kFileIndexStatusCfgPath)",
                    Error::kLoadFailed, "Cannot load json: " + path, Subject{Subject::kFile, path});
}

long long StatusMgr::GetPauseInfo() const {
  long long resume_time = kNotPaused;
  GetJsonValue(resume_time, data_, kResumeTime, false);
  return resume_time;
}

int StatusMgr::GetShareStatus(const std::string& share) const {
  Json::Value shares;
  int bits = 0;
  GetJsonValue(shares, data_, kShare, false);
  GetJsonValue(bits, shares, share, false);
  return bits;
}

void StatusMgr::SetShareStatus(const std::string& share, int bits) {
  const LockFile lock(StatusLockPath(), true);
  data_[kShare][share] = OldBits(data_, share) | static_cast<unsigned int>(bits);
  Save();
}

void StatusMgr::UnsetShareStatus(const std::string& share, int bits) {
  const LockFile lock(StatusLockPath(), true);
  data_[kShare][share] = OldBits(data_, share) & ~static_cast<unsigned int>(bits);
  Save();
}

void StatusMgr::ClearShareStatus(const std::string& share) {
  const LockFile lock(StatusLockPath(), true);
  data_[kShare].removeMember(share);
  Save();
}

void StatusMgr::Pause(int hours) {
  const LockFile lock(StatusLockPath(), true);
  FERROX_FAIL_IF(0 > hours, Error::kBadArgument, "Pause length should NOT be negative");
  const long long resume_time = DeadlineAfter(hours);
  data_[kResumeTime] = static_cast<Json::Int64>(resume_time);
  Save();
  Json::Value parameter(Json::objectValue);
  parameter[kResumeTime] = static_cast<Json::Int64>(resume_time);
  SendCommandToDaemon("pause", parameter);
}

void StatusMgr::Resume() {
  const LockFile lock(StatusLockPath(), true);
  data_[kResumeTime] = static_cast<Json::Int64>(kNotPaused);
  Save();
  SendCommandToDaemon("resume", Json::Value());
}

void StatusMgr::Save() {
  const std::string path = StatusPath();
  const sdk::SDKCredentials credentials("root");
  FERROX_FAIL_IF_AS(!toFile(data_, path), "!data_.toFile(kFileIndexStatusCfgPath)", Error::kSaveFailed,
                    "Failed to save json: " + path);
  FERROX_FAIL_IF_AS(-1 == chmod(path.c_str(), 0644), "-1 == chmod(kFileIndexStatusCfgPath, 0644)", Error::kInternal,
                    "chmod failed, reason=" + ErrnoText());
}

}  // namespace ferrox::fileindex
