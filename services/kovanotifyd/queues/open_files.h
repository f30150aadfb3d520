#pragma once

#include <chrono>
#include <cstddef>
#include <functional>
#include <map>
#include <string>

namespace ferrox::notifyd {

/// Files that are being written to and of which that has not been reported yet. One is due once it has been quiet for
/// some time, or at the latest some longer time after its first write.
class OpenFiles {
 public:
  using TimePoint = std::chrono::steady_clock::time_point;
  using Report = std::function<void(const std::string& path)>;

  OpenFiles(std::chrono::milliseconds quiet, std::chrono::milliseconds longest, size_t max)
      : quiet_(quiet), longest_(longest), max_(max) {}

  /// A write to a file that is already known; whether it is.
  bool Touch(const std::string& path, TimePoint now);
  /// A write to a file. Where there is no more room, the files that would be due first are reported at once.
  void Add(const std::string& path, TimePoint now, const Report& report);
  /// What is at or below the path is gone, or was reported otherwise.
  void Forget(const std::string& path, bool is_folder);
  /// What is at or below the old path is at the new one now.
  void Move(const std::string& old_path, const std::string& path, bool is_folder);

  void ReportDue(TimePoint now, const Report& report);
  void ReportAll(const Report& report);
  /// When ReportDue may have something to report; TimePoint::max() without files.
  TimePoint NextDue() const { return due_.empty() ? TimePoint::max() : due_.begin()->first; }

 private:
  struct File {
    TimePoint first;
    TimePoint last;
    std::multimap<TimePoint, const std::string*>::iterator due = {};
  };
  using Files = std::map<std::string, File, std::less<>>;

  TimePoint DueOf(const File& file) const { return std::min(file.last + quiet_, file.first + longest_); }
  void Schedule(Files::iterator file, TimePoint due) { file->second.due = due_.emplace(due, &file->first); }
  void Remove(Files::iterator file);
  std::string TakeFirst();
  template <typename Visit>
  void ForEachAt(const std::string& path, bool is_folder, const Visit& visit);

  std::chrono::milliseconds quiet_;
  std::chrono::milliseconds longest_;
  size_t max_;
  Files files_;
  // When to look at each file again: never later than it is due. A write to a known file leaves this as it is.
  std::multimap<TimePoint, const std::string*> due_;
};

}  // namespace ferrox::notifyd
