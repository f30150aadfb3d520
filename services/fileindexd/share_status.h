#pragma once

#include <atomic>
#include <cstdint>
#include <map>
#include <string>

#include <json/value.h>

#include "base/mutex.h"
#include "services/fileindexd/comparison_progress.h"
#include "services/fileindexd/file_failures.h"
#include "services/fileindexd/rate.h"

namespace ferrox::indexd {

/// State and counters of one share's indexing, for the "status" command. The worker's threads report to it, request
/// threads read it. Every call is safe from any thread and returns at once.
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

  /// `detail` is a sentence that says why; "" where the state says all.
  void SetState(State state, const std::string& detail = "");

  /// A pass over `operations` queued operations begins, or ends.
  void BeginPass(uint64_t operations);
  void EndPass();
  void OperationDone();

  /// A comparison of disk and index begins, or ends. The figures of the last one stay.
  void BeginComparison(const std::string& path);
  void EndComparison();
  void FileExamined(uint64_t count = 1);
  void SetEstimate(uint64_t files, bool complete);

  void DocumentsWritten(uint64_t count = 1);
  void FileRead() { ++files_read_; }
  uint64_t FilesRead() const { return files_read_; }
  void DocumentsDeleted(uint64_t count);
  void LinksSkipped(uint64_t count);
  /// A file that could not be indexed as it should; the work goes on.
  void AddFailure(const std::string& reason, const std::string& path);
  /// An ignore file was looked for; `reason` says why it is not followed, "" when it is, or is missing.
  void PatternFileRead(const std::string& path, const std::string& reason);
  /// What was at the path, or below it, is there no longer.
  void PatternFilesGone(const std::string& path);
  void Committed();

  /// The members are described in docs/formats/daemon.md.
  Json::Value ToJson() const;

 private:
  mutable base::Mutex mutex_;
  State state_ BASE_GUARDED_BY(mutex_) = State::kStarting;
  std::string detail_ BASE_GUARDED_BY(mutex_);
  uint64_t operations_ BASE_GUARDED_BY(mutex_) = 0;  ///< of the pass under way
  uint64_t operations_done_ BASE_GUARDED_BY(mutex_) = 0;
  ComparisonProgress comparison_ BASE_GUARDED_BY(mutex_);
  uint64_t written_ BASE_GUARDED_BY(mutex_) = 0;
  std::atomic<uint64_t> files_read_{0};
  Rate rate_ BASE_GUARDED_BY(mutex_);  ///< of documents written
  uint64_t deleted_ BASE_GUARDED_BY(mutex_) = 0;
  uint64_t links_skipped_ BASE_GUARDED_BY(mutex_) = 0;
  int64_t last_commit_ BASE_GUARDED_BY(mutex_) = 0;  ///< seconds since the epoch
  FileFailures failures_ BASE_GUARDED_BY(mutex_);
  std::map<std::string, std::string> refused_patterns_ BASE_GUARDED_BY(mutex_);  ///< reasons by ignore file
};

}  // namespace ferrox::indexd
