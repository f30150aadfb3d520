#include "services/fileindexd/file_failures.h"

#include <cstddef>

namespace ferrox::indexd {

namespace {

constexpr size_t kExamplesKept = 3;
constexpr size_t kReasonsKept = 100;

}  // namespace

void FileFailures::Add(const std::string& reason, const std::string& path) {
  const bool known = by_reason_.count(reason) != 0 || by_reason_.size() < kReasonsKept;
  Failure& failure = by_reason_[known ? reason : "other reasons"];
  ++failure.count;
  if (failure.examples.size() < kExamplesKept) failure.examples.push_back(path);
}

uint64_t FileFailures::Count() const {
  uint64_t count = 0;
  for (const auto& [reason, failure] : by_reason_) count += failure.count;
  return count;
}

Json::Value FileFailures::ToJson() const {
  Json::Value json(Json::objectValue);
  for (const auto& [reason, failure] : by_reason_) {
    Json::Value& entry = json[reason];
    entry["count"] = Json::UInt64(failure.count);
    for (const std::string& path : failure.examples) entry["examples"].append(path);
  }
  return json;
}

}  // namespace ferrox::indexd
