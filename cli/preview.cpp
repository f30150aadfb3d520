#include "cli/preview.h"

#include <dirent.h>
#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>
#include <chrono>
#include <cstdio>
#include <cstring>
#include <utility>

#include "base/files.h"
#include "cli/escape.h"
#include "cli/format.h"
#include "cli/output.h"
#include "cli/progress.h"
#include "cli/share_place.h"
#include "fileindex/util.h"

namespace ferrox::cli {

namespace {

/// One walk. Folders wait in a list instead of on the stack, so that no depth of folders can exhaust it.
class PreviewWalk {
 public:
  PreviewWalk(std::string root, const Kinds& kinds, const std::map<std::string, std::string>& others)
      : root_(std::move(root)), kinds_(kinds), others_(others) {}

  Preview Run(const std::string& folder, const std::function<void(uint64_t files)>& progress) {
    waiting_.push_back(folder);
    while (!waiting_.empty()) {
      const std::string next = std::move(waiting_.back());
      waiting_.pop_back();
      Enter(next);
      progress(preview_.all.files);
    }
    return std::move(preview_);
  }

 private:
  /// The rules of places need a look at the disk and are asked for each folder once: for the top one with all above it,
  /// for those below it alone.
  std::string WhyNotEntered(const std::string& folder) {
    const auto other = others_.find(folder);
    if (other != others_.end()) return other->second;
    const std::string above = entered_ == 0 ? root_ : folder.substr(0, folder.rfind('/'));
    return WhyFolderLeftOut(above, folder);
  }

  void Enter(const std::string& folder) {
    const std::string why = WhyNotEntered(folder);
    if (!why.empty()) return preview_.LeaveOut(folder, why);
    const int fd = open(folder.c_str(), O_RDONLY | O_DIRECTORY | O_NOFOLLOW | O_CLOEXEC);
    const base::OpenFolderPtr entries(fd < 0 ? nullptr : fdopendir(fd));
    if (entries == nullptr) return preview_.LeaveOut(folder, std::string("it cannot be read: ") + strerror(errno));
    if (entered_++ != 0) ++preview_.folders;
    while (const dirent* entry = readdir(entries.get())) {
      const std::string name = entry->d_name;
      if (name != "." && name != ".." && !fileindex::IsSystemPreservedFileName(name)) Take(fd, folder, name);
    }
  }

  void Take(int fd, const std::string& folder, const std::string& name) {
    struct stat status = {};
    if (fstatat(fd, name.c_str(), &status, AT_SYMLINK_NOFOLLOW) != 0) return;  // gone in between
    const std::string path = (folder == "/" ? "" : folder) + "/" + name;
    if (S_ISDIR(status.st_mode)) return waiting_.push_back(path);
    if (S_ISLNK(status.st_mode)) {
      ++preview_.links;
      return;
    }
    const auto size = static_cast<uint64_t>(status.st_size);
    const std::string kind = KindNameOf(path);
    preview_.all.Add(size);
    preview_.kinds[kind.empty() ? "other" : kind].Add(size);
    if (kinds_.WantsContent(path)) preview_.content.Add(size);
  }

  const std::string root_;
  const Kinds& kinds_;
  const std::map<std::string, std::string>& others_;
  std::vector<std::string> waiting_;
  uint64_t entered_ = 0;
  Preview preview_;
};

std::string TotalText(const FileTotal& total) {
  return Count(total.files) + (total.files == 1 ? " file, " : " files, ") + Size(static_cast<int64_t>(total.bytes));
}

Json::Value TotalJson(const FileTotal& total) {
  Json::Value json;
  json["files"] = Json::UInt64(total.files);
  json["bytes"] = Json::UInt64(total.bytes);
  return json;
}

Json::Value PreviewJson(const std::string& name, const Preview& preview) {
  Json::Value json = TotalJson(preview.all);
  json["path"] = name;
  json["folders"] = Json::UInt64(preview.folders);
  json["content"] = TotalJson(preview.content);
  json["kinds"] = Json::Value(Json::objectValue);
  for (const auto& [kind, total] : preview.kinds) json["kinds"][kind] = TotalJson(total);
  json["links"] = Json::UInt64(preview.links);
  json["left_out"] = Json::Value(Json::arrayValue);
  for (const auto& [path, reason] : preview.left_out) {
    Json::Value& entry = json["left_out"].append(Json::Value());
    entry["path"] = path;
    entry["reason"] = reason;
  }
  json["more_left_out"] = Json::UInt64(preview.more_left_out);
  return json;
}

}  // namespace

void Preview::LeaveOut(const std::string& path, const std::string& reason) {
  if (left_out.size() < kLeftOutMax) {
    left_out.emplace_back(path, reason);
  } else {
    ++more_left_out;
  }
}

Preview WalkForPreview(const std::string& root, const std::string& folder, const Kinds& kinds,
                       const std::map<std::string, std::string>& others,
                       const std::function<void(uint64_t files)>& progress) {
  return PreviewWalk(root, kinds, others).Run(folder, progress);
}

void PrintPreview(const std::string& name, const Preview& preview, bool json) {
  if (json) return PrintJson(PreviewJson(name, preview));
  (void)printf("%s: %s, in %s folders\n", EscapeForTerminal(name).c_str(), TotalText(preview.all).c_str(),
               Count(preview.folders + 1).c_str());
  (void)printf("    content would be read of: %s\n", TotalText(preview.content).c_str());
  for (const auto& [kind, total] : preview.kinds) {
    (void)printf("    %s: %s\n", kind.c_str(), TotalText(total).c_str());
  }
  if (preview.links != 0) (void)printf("    links, which are not indexed: %s\n", Count(preview.links).c_str());
  for (const auto& [path, reason] : preview.left_out) {
    (void)printf("    left out: %s: %s\n", EscapeForTerminal(path).c_str(), EscapeForTerminal(reason).c_str());
  }
  if (preview.more_left_out != 0) (void)printf("    left out: %s more folders\n", Count(preview.more_left_out).c_str());
}

bool IsDryRun(const Arguments& arguments) {
  const bool is_dry = arguments.Has("--dry-run");
  if (!is_dry && arguments.Has("--json")) throw UsageError("--json goes with --dry-run");
  return is_dry;
}

void ShowPreview(const std::string& name, const std::string& root, const std::string& folder, const Kinds& kinds,
                 std::map<std::string, std::string> others, bool json) {
  constexpr std::chrono::milliseconds kBetween(100);
  for (const SharePlace& inner : IndexedSharesBelow(folder)) {
    others[inner.root] = "its files are those of share " + inner.share;
  }
  Progress progress(isatty(STDERR_FILENO) == 1);
  const auto begin = std::chrono::steady_clock::now();
  auto shown = begin;
  const auto show = [&](uint64_t files) {
    const auto now = std::chrono::steady_clock::now();
    if (now - shown < kBetween) return;
    shown = now;
    Json::Value state;
    state["state"] = "indexing";
    state["comparison"]["running"] = true;
    state["comparison"]["examined"] = Json::UInt64(files);
    state["comparison"]["estimate_complete"] = false;
    state["comparison"]["elapsed_ms"] =
        Json::Int64(std::chrono::duration_cast<std::chrono::milliseconds>(now - begin).count());
    progress.Show(state);
  };
  const Preview preview = WalkForPreview(root, folder, kinds, others, show);
  progress.Clear();
  PrintPreview(name, preview, json);
}

}  // namespace ferrox::cli
