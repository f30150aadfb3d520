#pragma once

#include <array>
#include <atomic>
#include <cstdint>
#include <map>
#include <mutex>
#include <string>
#include <vector>

#include <json/value.h>

namespace ferrox::indexd {

/// How many a second there were, over the last ten seconds.
class Rate {
 public:
  void Count(int64_t now_ms);
  double PerSecond(int64_t now_ms) const;

 private:
  static constexpr int64_t kSeconds = 10;
  struct Bucket {
    int64_t second = -kSeconds;
    uint64_t count = 0;
  };
  std::array<Bucket, kSeconds> buckets_;
};

/// What people can see of one share's indexing. Every call is safe from any thread.
class ShareStatus {
 public:
  enum class State {
    kStarting,
    kIdle,
    kIndexing,
    kPaused,
    kWaitingForSpace,
    kWaitingForEngine,
    kWaitingForVolume,
    kWaitingForContent,
    kError
  };

  /// `detail` says in a sentence why, for the states that wait.
  void SetState(State state, const std::string& detail = "");
  State GetState() const;

  /// A pass over `operations` queued operations begins, or ends.
  void BeginPass(uint64_t operations);
  void EndPass();
  void OperationDone();

  /// A comparison of disk and index begins, or ends. The figures of the last one stay.
  void BeginComparison(const std::string& path);
  void EndComparison();
  void FileExamined();
  void SetEstimate(uint64_t files, bool complete);

  void DocumentWritten();
  void FileRead() { ++files_read_; }
  uint64_t FilesRead() const { return files_read_; }
  void DocumentsDeleted(uint64_t count) { Add(deleted_, count); }
  void LinksSkipped(uint64_t count) { Add(links_skipped_, count); }
  /// A file that could not be indexed as it should; it did not stop the work.
  void AddFailure(const std::string& reason, const std::string& path);
  void Committed();

  /// The members are described in docs/formats/daemon.md.
  Json::Value ToJson() const;

 private:
  struct Failure {
    uint64_t count = 0;
    std::vector<std::string> examples;
  };
  void Add(uint64_t& counter, uint64_t count);

  mutable std::mutex mutex_;
  State state_ = State::kStarting;
  std::string detail_;
  uint64_t operations_ = 0;
  uint64_t operations_done_ = 0;
  bool comparing_ = false;
  std::string compared_path_;
  int64_t comparison_began_ms_ = 0;
  int64_t comparison_ended_ms_ = 0;
  uint64_t examined_ = 0;
  uint64_t estimate_ = 0;
  bool estimate_complete_ = false;
  uint64_t written_ = 0;
  std::atomic<uint64_t> files_read_{0};
  Rate rate_;
  uint64_t deleted_ = 0;
  uint64_t links_skipped_ = 0;
  int64_t last_commit_ = 0;
  std::map<std::string, Failure> failures_;
};

}  // namespace ferrox::indexd
