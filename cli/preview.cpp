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
#include "cli/excluded.h"
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
  explicit PreviewWalk(const PreviewRequest& request) : request_(request), exclusions_(request.root, request.rules) {}

  Preview Run(const std::function<void(uint64_t files)>& progress) {
    waiting_.push_back(request_.folder);
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
    const auto other = request_.others.find(folder);
    if (other != request_.others.end()) return other->second;
    const std::string above = entered_ == 0 ? request_.root : folder.substr(0, folder.rfind('/'));
    return WhyFolderLeftOut(above, folder);
  }

  void Enter(const std::string& folder) {
    const std::string why = WhyNotEntered(folder);
    if (!why.empty()) return preview_.LeaveOut(folder, why);
    const int fd = open(folder.c_str(), O_RDONLY | O_DIRECTORY | O_NOFOLLOW | O_CLOEXEC);
    const base::OpenFolderPtr entries(fd < 0 ? nullptr : fdopendir(fd));
    if (entries == nullptr) return preview_.LeaveOut(folder, std::string("it cannot be read: ") + strerror(errno));
    if (entered_++ != 0) ++preview_.folders;
    const services::Exclusions::FolderPtr excluded = exclusions_.In(folder);
    while (const dirent* entry = readdir(entries.get())) {
      const std::string name = entry->d_name;
      if (name == "." || name == ".." || fileindex::IsSystemPreservedFileName(name)) continue;
      struct stat status = {};
      if (fstatat(fd, name.c_str(), &status, AT_SYMLINK_NOFOLLOW) != 0) continue;  // gone in between
      Take(status, (folder == "/" ? "" : folder) + "/" + name, excluded->Of(name, S_ISDIR(status.st_mode)));
    }
  }

  void Take(const struct stat& status, const std::string& path, services::Exclusion exclusion) {
    const bool is_out = exclusion == services::Exclusion::kLeftOut;
    if (S_ISDIR(status.st_mode)) {
      if (!is_out) return waiting_.push_back(path);
      return preview_.LeaveOut(path, ExclusionText(exclusions_.Explain(path, true), path));
    }
    if (S_ISLNK(status.st_mode)) {
      ++preview_.links;
      return;
    }
    const auto size = static_cast<uint64_t>(status.st_size);
    if (is_out) return preview_.excluded.Add(size);
    const std::string kind = KindNameOf(path);
    preview_.all.Add(size);
    preview_.kinds[kind.empty() ? "other" : kind].Add(size);
    const bool is_name_only = exclusion == services::Exclusion::kNameOnly;
    if (!is_name_only && request_.kinds.WantsContent(path)) preview_.content.Add(size);
  }

  const PreviewRequest& request_;
  services::Exclusions exclusions_;
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
  json["excluded"] = TotalJson(preview.excluded);
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

Preview WalkForPreview(const PreviewRequest& request, const std::function<void(uint64_t files)>& progress) {
  return PreviewWalk(request).Run(progress);
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
  if (preview.excluded.files != 0) (void)printf("    left out by patterns: %s\n", TotalText(preview.excluded).c_str());
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

void ShowPreview(PreviewRequest request, bool json) {
  constexpr std::chrono::milliseconds kBetween(100);
  for (const SharePlace& inner : IndexedSharesBelow(request.folder)) {
    request.others[inner.root] = "its files are those of share " + inner.share;
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
  const Preview preview = WalkForPreview(request, show);
  progress.Clear();
  PrintPreview(request.name, preview, json);
}

}  // namespace ferrox::cli
