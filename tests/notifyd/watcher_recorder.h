#pragma once

#include <sys/stat.h>

#include <filesystem>
#include <set>
#include <string>
#include <utility>
#include <vector>

#include "services/kovanotifyd/watcher.h"

namespace ferrox::test {

/// Keeps what a watcher tells, with paths relative to a folder, and replays it as the index does: a created or
/// uncertain folder is compared with the disk, and so are both places of a rename.
class WatcherRecorder : public notifyd::WatchListener {
 public:
  explicit WatcherRecorder(std::string top) : top_(std::move(top) + "/") {}

  void OnChange(notifyd::Change change) override {
    if (change.file != 0) return (void)numbers.insert(change.file);
    log.push_back(Text(change));
    changes.push_back(change);
    using Kind = notifyd::Change::Kind;
    if (change.kind == Kind::kDeleted && !change.is_folder) {
      model.erase(change.path);
    } else {
      Compare(change.path);
    }
    if (!change.old_path.empty()) Compare(change.old_path);
  }
  void OnCovered(const std::string& root) override {
    log.push_back("covered " + Short(root));
    Compare(root);
  }
  void OnRefused(const std::string& root, const std::string& reason) override {
    log.push_back("refused " + Short(root) + ": " + reason);
  }
  void OnLost() override { log.emplace_back("lost"); }
  void OnRootDisturbed(const std::string& root) override { log.push_back("disturbed " + Short(root)); }
  void OnCookie() override { log.emplace_back("cookie"); }

  /// Everything at and below the path that is there.
  static void AddAll(const std::string& path, std::set<std::string>& paths) {
    struct stat status = {};
    if (lstat(path.c_str(), &status) < 0) return;
    paths.insert(path);
    std::error_code error;
    if (!S_ISDIR(status.st_mode)) return;
    for (const auto& entry : std::filesystem::directory_iterator(path, error)) AddAll(entry.path().string(), paths);
  }

  std::vector<std::string> Take() { return std::exchange(log, {}); }
  bool Has(const std::string& line) const { return std::find(log.begin(), log.end(), line) != log.end(); }

  std::vector<std::string> log;
  std::vector<notifyd::Change> changes;
  std::set<std::string> model;
  std::set<uint64_t> numbers;  ///< of files

 private:
  std::string Short(const std::string& path) const {
    return path.compare(0, top_.size(), top_) == 0 ? path.substr(top_.size()) : path;
  }
  std::string Text(const notifyd::Change& change) const {
    constexpr const char* kNames[] = {"created",  "modified", "written", "attributes",
                                      "deleted",  "renamed",  "number",  "number's attributes",
                                      "uncertain"};
    std::string text = kNames[static_cast<int>(change.kind)];
    if (!change.old_path.empty()) text += " " + Short(change.old_path) + " ->";
    return text + " " + Short(change.path) + (change.is_folder ? "/" : "");
  }
  void Compare(const std::string& path) {
    model.erase(path);
    model.erase(model.lower_bound(path + "/"), model.lower_bound(path + "0"));  // "0" follows "/"
    AddAll(path, model);
  }

  std::string top_;
};

}  // namespace ferrox::test
