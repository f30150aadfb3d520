#include "platform/host/samba_files.h"

#include <set>

#include "platform/host/files.h"

namespace kova::host {

namespace {

constexpr size_t kIncludedMax = 100;

}  // namespace

bool IsSpecialSection(const std::string& section) {
  static const std::set<std::string> special = {"global", "homes", "printers", "print$", "ipc$"};
  return special.count(SmbConf::Fold(section)) != 0;
}

std::vector<IncludedFile> ReadIncludedFiles(const SmbConf& conf) {
  std::vector<IncludedFile> files;
  std::vector<std::string> paths = conf.All("include");
  std::set<std::string> seen;
  for (size_t i = 0; i < paths.size() && files.size() < kIncludedMax; ++i) {
    const std::string path = paths[i];
    const bool one_file = path.compare(0, 1, "/") == 0 && path.find('%') == std::string::npos;
    std::string text;
    if (!one_file || !seen.insert(path).second || !ReadTextFile(path, text).empty()) continue;
    files.push_back({path, SmbConf(std::move(text))});
    for (const std::string& next : files.back().conf.All("include")) paths.push_back(next);
  }
  return files;
}

}  // namespace kova::host
