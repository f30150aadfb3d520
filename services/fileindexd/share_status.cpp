#include "services/fileindexd/share_status.h"

#include <chrono>
#include <cstddef>

#include "base/path.h"
#include "common/clock.h"

namespace ferrox::indexd {

namespace {

constexpr size_t kRefusedPatternsKept = 100;

const char* StateName(ShareStatus::State state) {
  constexpr const char* kNames[] = {"starting",
                                    "idle",
                                    "indexing",
                                    "paused",
                                    "waiting for space",
                                    "waiting for engine",
                                    "waiting for volume",
                                    "waiting for content extraction",
                                    "error"};
  return kNames[static_cast<int>(state)];
}

int64_t SteadyMilliseconds() {
  const auto now = std::chrono::steady_clock::now().time_since_epoch();
  return std::chrono::duration_cast<std::chrono::milliseconds>(now).count();
}

}  // namespace

void ShareStatus::SetState(State state, const std::string& detail) {
  const base::MutexLock lock(mutex_);
  state_ = state;
  detail_ = detail;
}

void ShareStatus::BeginPass(uint64_t operations) {
  const base::MutexLock lock(mutex_);
  state_ = State::kIndexing;
  detail_.clear();
  operations_ = operations;
  operations_done_ = 0;
}

/// Also ends the comparison of a pass that stops in its middle.
void ShareStatus::EndPass() {
  const base::MutexLock lock(mutex_);
  operations_ = operations_done_ = 0;
  comparison_.End(SteadyMilliseconds());
}

void ShareStatus::OperationDone() {
  const base::MutexLock lock(mutex_);
  ++operations_done_;
}

void ShareStatus::BeginComparison(const std::string& path) {
  const base::MutexLock lock(mutex_);
  comparison_ = {.running = true, .path = path, .began_ms = SteadyMilliseconds()};
}

void ShareStatus::EndComparison() {
  const base::MutexLock lock(mutex_);
  comparison_.End(SteadyMilliseconds());
}

void ShareStatus::FileExamined(uint64_t count) {
  const base::MutexLock lock(mutex_);
  comparison_.examined += count;
}

void ShareStatus::SetEstimate(uint64_t files, bool complete) {
  const base::MutexLock lock(mutex_);
  comparison_.estimate = files;
  comparison_.estimate_complete = complete;
}

void ShareStatus::DocumentsWritten(uint64_t count) {
  const base::MutexLock lock(mutex_);
  written_ += count;
  rate_.Count(SteadyMilliseconds(), count);
}

void ShareStatus::DocumentsDeleted(uint64_t count) {
  const base::MutexLock lock(mutex_);
  deleted_ += count;
}

void ShareStatus::LinksSkipped(uint64_t count) {
  const base::MutexLock lock(mutex_);
  links_skipped_ += count;
}

void ShareStatus::AddFailure(const std::string& reason, const std::string& path) {
  const base::MutexLock lock(mutex_);
  failures_.Add(reason, path);
}

void ShareStatus::PatternFileRead(const std::string& path, const std::string& reason) {
  const base::MutexLock lock(mutex_);
  if (reason.empty()) {
    refused_patterns_.erase(path);
  } else if (refused_patterns_.size() < kRefusedPatternsKept || refused_patterns_.count(path) != 0) {
    refused_patterns_[path] = reason;
  }
}

void ShareStatus::PatternFilesGone(const std::string& path) {
  const base::MutexLock lock(mutex_);
  std::erase_if(refused_patterns_, [&path](const auto& file) { return base::IsAtOrBelow(file.first, path); });
}

void ShareStatus::Committed() {
  const base::MutexLock lock(mutex_);
  last_commit_ = Clock::Get().Now();
}

Json::Value ShareStatus::ToJson() const {
  const base::MutexLock lock(mutex_);
  const int64_t now_ms = SteadyMilliseconds();
  Json::Value json;
  json["state"] = StateName(state_);
  if (!detail_.empty()) json["detail"] = detail_;
  json["operations"] = Json::UInt64(operations_);
  json["operations_done"] = Json::UInt64(operations_done_);
  json["comparison"] = comparison_.ToJson(now_ms);
  json["rate"] = rate_.PerSecond(now_ms);
  json["written"] = Json::UInt64(written_);
  json["read"] = Json::UInt64(files_read_);
  json["deleted"] = Json::UInt64(deleted_);
  json["links_skipped"] = Json::UInt64(links_skipped_);
  if (last_commit_ != 0) json["last_commit"] = Json::Int64(last_commit_);
  json["failed"] = Json::UInt64(failures_.Count());
  json["failures"] = failures_.ToJson();
  for (const auto& [path, reason] : refused_patterns_) {
    Json::Value& entry = json["refused_patterns"].append(Json::Value());
    entry["path"] = path;
    entry["reason"] = reason;
  }
  return json;
}

}  // namespace ferrox::indexd
