#pragma once

#include <algorithm>
#include <chrono>
#include <cstddef>
#include <functional>
#include <map>
#include <string>

namespace ferrox::notifyd {

/// Joins the writes to each file into few reports. A file is due once no write came for the time `quiet`, or at the
/// latest the time `longest` after its first write that is not reported. Belongs to one thread.
///
/// Files are ordered by a lower bound of when they are due. A write to a known file only notes its time, which is
/// cheap; the bound is corrected when it is reached (ReportDue).
class WriteDebouncer {
 public:
  using TimePoint = std::chrono::steady_clock::time_point;
  using Report = std::function<void(const std::string& path)>;

  /// Keeps at most `max` files.
  WriteDebouncer(std::chrono::milliseconds quiet, std::chrono::milliseconds longest, size_t max)
      : quiet_(quiet), longest_(longest), max_(max) {}

  /// Notes a write if the file has one that is not reported yet. Returns whether it has.
  bool Touch(const std::string& path, TimePoint now);
  /// Notes a write. When there are too many files, those that would be due first are reported at once.
  void Add(const std::string& path, TimePoint now, const Report& report);
  /// Drops what is at the path and, of a folder, below it: it is gone, or its writes were reported otherwise.
  void Forget(const std::string& path, bool is_folder);
  /// Renames what is at the old path and, of a folder, below it. Drops what the new path had.
  void Move(const std::string& old_path, const std::string& path, bool is_folder);

  /// Reports and drops the files that are due, or all files.
  void ReportDue(TimePoint now, const Report& report);
  void ReportAll(const Report& report);
  /// When ReportDue may have something to report; TimePoint::max() without files.
  TimePoint NextDue() const { return due_.empty() ? TimePoint::max() : due_.begin()->first; }

 private:
  using Schedule = std::multimap<TimePoint, const std::string*>;  ///< points to the keys of files_
  struct File {
    TimePoint first;  ///< write that is not reported
    TimePoint last;   ///< write
    Schedule::iterator due = {};
  };
  using Files = std::map<std::string, File, std::less<>>;

  TimePoint DueOf(const File& file) const { return std::min(file.last + quiet_, file.first + longest_); }
  void SetDue(Files::iterator file, TimePoint due) { file->second.due = due_.emplace(due, &file->first); }
  void Remove(Files::iterator file);
  std::string TakeFirst();
  template <typename Visit>
  void ForEachAt(const std::string& path, bool is_folder, const Visit& visit);

  std::chrono::milliseconds quiet_;
  std::chrono::milliseconds longest_;
  size_t max_;
  Files files_;
  Schedule due_;  ///< each file once, never later than it is due
};

}  // namespace ferrox::notifyd
