#include "services/support/exclusion_source.h"

#include <sys/stat.h>

#include <cerrno>
#include <cstdint>
#include <utility>

#include "base/files.h"
#include "base/open_beneath.h"
#include "base/unique_fd.h"
#include "common/file_util.h"
#include "common/log.h"

namespace ferrox::services {

namespace {

constexpr std::string_view kNameOnly = "#: name only";
constexpr std::string_view kNotAtAll = "#: not at all";
constexpr std::string_view kByteOrderMark = "\xEF\xBB\xBF";

/// `folder` is the one in which the file was found.
std::string WhyRefused(const struct stat& file, const struct stat& folder) {
  if (!S_ISREG(file.st_mode)) return "it is no regular file";
  if (file.st_uid != folder.st_uid && file.st_uid != 0) return "it belongs neither to the folder's owner nor to root";
  // Who may change one of the others would decide here, and no event would tell.
  if (file.st_nlink > 1) return "it has further names (hard links)";
  if (file.st_size > static_cast<off_t>(kIgnoreFileBytesMax)) return "it is larger than 64 KiB";
  return "";
}

}  // namespace

std::shared_ptr<const ExclusionSource> SourceOf(const std::string& origin, const base::PatternLists& lists) {
  if (lists.Empty()) return nullptr;
  auto source = std::make_shared<ExclusionSource>();
  source->origin = origin;
  for (const std::string& pattern : lists.exclude) (void)source->exclude.Add(pattern, 0);
  for (const std::string& pattern : lists.exclude_content) (void)source->exclude_content.Add(pattern, 0);
  return source;
}

std::string AddIgnoreFileText(std::string_view text, ExclusionSource& source) {
  if (text.starts_with(kByteOrderMark)) text.remove_prefix(kByteOrderMark.size());
  base::IgnorePatterns* patterns = &source.exclude;
  for (uint32_t number = 1; !text.empty(); ++number) {
    const size_t end = text.find('\n');
    std::string_view line = text.substr(0, end);
    text.remove_prefix(end == std::string_view::npos ? text.size() : end + 1);
    if (line.ends_with('\r')) line.remove_suffix(1);
    if (line == kNameOnly) patterns = &source.exclude_content;
    if (line == kNotAtAll) patterns = &source.exclude;
    (void)patterns->Add(line, number);
    if (source.exclude.Count() + source.exclude_content.Count() > kIgnorePatternsMax) {
      return "it has more than 1,000 patterns";
    }
  }
  return "";
}

IgnoreFile ReadIgnoreFile(const std::string& root, const std::string& folder) {
  const std::string path = folder + "/" + kIgnoreFileName;
  const base::UniqueFd file = base::OpenBeneath(root, path);
  if (!file.Valid()) {
    if (errno == ELOOP) return {nullptr, "it is a link"};
    for (const int none : {ENOENT, ENOTDIR, EXDEV, ENAMETOOLONG}) {
      if (errno == none) return {};
    }
    return {nullptr, "it cannot be opened: " + ErrnoText()};
  }
  struct stat status = {};
  struct stat folder_status = {};
  if (fstat(file.Get(), &status) != 0 || lstat(folder.c_str(), &folder_status) != 0) return {};
  const std::string refused = WhyRefused(status, folder_status);
  if (!refused.empty()) return {nullptr, refused};
  std::string text;
  if (!base::ReadAll(file.Get(), text, kIgnoreFileBytesMax)) {
    return {nullptr, errno == EFBIG ? "it is larger than 64 KiB" : "it cannot be read: " + ErrnoText()};
  }
  auto source = std::make_shared<ExclusionSource>();
  source->origin = path;
  source->is_file = true;
  const std::string too_many = AddIgnoreFileText(text, *source);
  if (!too_many.empty()) return {nullptr, too_many};
  return {std::move(source), ""};
}

}  // namespace ferrox::services
