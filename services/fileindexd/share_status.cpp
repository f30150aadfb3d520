#include "services/fileindexd/share_status.h"

#include <algorithm>
#include <chrono>

#include "common/clock.h"

namespace ferrox::indexd {

namespace {

constexpr size_t kExamplesKept = 3;
constexpr size_t kReasonsKept = 100;

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

void Rate::Count(int64_t now_ms) {
  const int64_t second = now_ms / 1000;
  Bucket& bucket = buckets_[static_cast<size_t>(second % kSeconds)];
  if (bucket.second != second) bucket = {second, 0};
  ++bucket.count;
}

/// Counted from the first of those seconds in which there was one, so that a rate does not sag at its beginning.
double Rate::PerSecond(int64_t now_ms) const {
  uint64_t sum = 0;
  int64_t since_ms = now_ms;
  for (const Bucket& bucket : buckets_) {
    if (bucket.second <= now_ms / 1000 - kSeconds) continue;
    sum += bucket.count;
    since_ms = std::min(since_ms, bucket.second * 1000);
  }
  return sum == 0 ? 0
                  : static_cast<double>(sum) * 1000 / static_cast<double>(std::max<int64_t>(now_ms - since_ms, 1000));
}

void ShareStatus::SetState(State state, const std::string& detail) {
  const std::lock_guard lock(mutex_);
  state_ = state;
  detail_ = detail;
}

ShareStatus::State ShareStatus::GetState() const {
  const std::lock_guard lock(mutex_);
  return state_;
}

void ShareStatus::BeginPass(uint64_t operations) {
  const std::lock_guard lock(mutex_);
  state_ = State::kIndexing;
  detail_.clear();
  operations_ = operations;
  operations_done_ = 0;
}

void ShareStatus::EndPass() {
  const std::lock_guard lock(mutex_);
  operations_ = operations_done_ = 0;
  if (comparing_) comparison_ended_ms_ = SteadyMilliseconds();
  comparing_ = false;
}

void ShareStatus::OperationDone() { Add(operations_done_, 1); }

void ShareStatus::BeginComparison(const std::string& path) {
  const std::lock_guard lock(mutex_);
  comparing_ = true;
  compared_path_ = path;
  comparison_began_ms_ = SteadyMilliseconds();
  examined_ = estimate_ = 0;
  estimate_complete_ = false;
}

void ShareStatus::EndComparison() {
  const std::lock_guard lock(mutex_);
  comparing_ = false;
  comparison_ended_ms_ = SteadyMilliseconds();
}

void ShareStatus::FileExamined() { Add(examined_, 1); }

void ShareStatus::SetEstimate(uint64_t files, bool complete) {
  const std::lock_guard lock(mutex_);
  estimate_ = files;
  estimate_complete_ = complete;
}

void ShareStatus::DocumentWritten() {
  const std::lock_guard lock(mutex_);
  ++written_;
  rate_.Count(SteadyMilliseconds());
}

void ShareStatus::AddFailure(const std::string& reason, const std::string& path) {
  const std::lock_guard lock(mutex_);
  const bool known = failures_.count(reason) != 0 || failures_.size() < kReasonsKept;
  Failure& failure = failures_[known ? reason : "other reasons"];
  ++failure.count;
  if (failure.examples.size() < kExamplesKept) failure.examples.push_back(path);
}

void ShareStatus::Committed() {
  const std::lock_guard lock(mutex_);
  last_commit_ = Clock::Get().Now();
}

void ShareStatus::Add(uint64_t& counter, uint64_t count) {
  const std::lock_guard lock(mutex_);
  counter += count;
}

Json::Value ShareStatus::ToJson() const {
  const std::lock_guard lock(mutex_);
  Json::Value json;
  json["state"] = StateName(state_);
  if (!detail_.empty()) json["detail"] = detail_;
  json["operations"] = Json::UInt64(operations_);
  json["operations_done"] = Json::UInt64(operations_done_);
  Json::Value& comparison = json["comparison"];
  comparison["running"] = comparing_;
  comparison["path"] = compared_path_;
  comparison["examined"] = Json::UInt64(examined_);
  comparison["estimate"] = Json::UInt64(estimate_);
  comparison["estimate_complete"] = estimate_complete_;
  comparison["elapsed_ms"] =
      Json::Int64((comparing_ ? SteadyMilliseconds() : comparison_ended_ms_) - comparison_began_ms_);
  json["rate"] = rate_.PerSecond(SteadyMilliseconds());
  json["written"] = Json::UInt64(written_);
  json["read"] = Json::UInt64(files_read_);
  json["deleted"] = Json::UInt64(deleted_);
  json["links_skipped"] = Json::UInt64(links_skipped_);
  if (last_commit_ != 0) json["last_commit"] = Json::Int64(last_commit_);
  uint64_t failed = 0;
  for (const auto& [reason, failure] : failures_) failed += failure.count;
  json["failed"] = Json::UInt64(failed);
  json["failures"] = Json::Value(Json::objectValue);
  for (const auto& [reason, failure] : failures_) {
    Json::Value& entry = json["failures"][reason];
    entry["count"] = Json::UInt64(failure.count);
    for (const std::string& path : failure.examples) entry["examples"].append(path);
  }
  return json;
}

}  // namespace ferrox::indexd
