#include "services/kovanotifyd/queues/write_debouncer.h"

#include <utility>
#include <vector>

namespace ferrox::notifyd {

bool WriteDebouncer::Touch(const std::string& path, TimePoint now) {
  const auto found = files_.find(path);
  if (found == files_.end()) return false;
  found->second.last = now;
  return true;
}

void WriteDebouncer::Add(const std::string& path, TimePoint now, const Report& report) {
  const auto [file, is_new] = files_.try_emplace(path, File{now, now});
  if (!is_new) {
    file->second.last = now;
    return;
  }
  SetDue(file, DueOf(file->second));
  while (files_.size() > max_) report(TakeFirst());
}

/// Calls `visit` for each file at the path and, of a folder, below it; it may remove that file.
template <typename Visit>
void WriteDebouncer::ForEachAt(const std::string& path, bool is_folder, const Visit& visit) {
  if (files_.empty()) return;
  if (const auto found = files_.find(path); found != files_.end()) visit(found);
  if (!is_folder) return;
  const std::string prefix = path + "/";
  for (auto at = files_.lower_bound(prefix); at != files_.end() && at->first.starts_with(prefix);) visit(at++);
}

void WriteDebouncer::Forget(const std::string& path, bool is_folder) {
  ForEachAt(path, is_folder, [this](Files::iterator file) { Remove(file); });
}

void WriteDebouncer::Move(const std::string& old_path, const std::string& path, bool is_folder) {
  Forget(path, is_folder);
  std::vector<std::pair<std::string, File>> moved;
  ForEachAt(old_path, is_folder, [&](Files::iterator file) {
    moved.emplace_back(path + file->first.substr(old_path.size()), file->second);
    Remove(file);
  });
  for (const auto& [new_path, file] : moved) {
    SetDue(files_.insert_or_assign(new_path, file).first, DueOf(file));
  }
}

void WriteDebouncer::ReportDue(TimePoint now, const Report& report) {
  while (NextDue() <= now) {
    const auto file = files_.find(*due_.begin()->second);
    const TimePoint due = DueOf(file->second);
    if (due <= now) {
      report(TakeFirst());
    } else {
      (void)due_.erase(due_.begin());
      SetDue(file, due);
    }
  }
}

void WriteDebouncer::ReportAll(const Report& report) {
  while (!files_.empty()) report(TakeFirst());
}

void WriteDebouncer::Remove(Files::iterator file) {
  (void)due_.erase(file->second.due);
  (void)files_.erase(file);
}

std::string WriteDebouncer::TakeFirst() {
  const auto file = files_.find(*due_.begin()->second);
  std::string path = file->first;
  Remove(file);
  return path;
}

}  // namespace ferrox::notifyd
