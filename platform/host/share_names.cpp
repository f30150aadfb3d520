#include "platform/host/share_names.h"

#include <algorithm>
#include <numeric>
#include <string_view>
#include <utility>

#include "platform/host/json_members.h"

namespace kova::host {

namespace {

// What the search engine takes of one share (docs/formats/engine.md).
constexpr size_t kPatternsMax = 1000;
constexpr size_t kPatternBytesMax = size_t{64} << 10;

size_t BytesOf(const std::vector<std::string>& patterns) {
  return std::accumulate(patterns.begin(), patterns.end(), size_t{0},
                         [](size_t bytes, const std::string& pattern) { return bytes + pattern.size() + 1; });
}

/// Adds the patterns of a list. @return what is wrong, as the end of a sentence; both lists together have bounds.
std::string TakePatterns(std::string_view list, ShareNames& names, std::vector<std::string>& patterns) {
  for (size_t begin = 0; begin < list.size();) {
    const size_t end = std::min(list.find('/', begin), list.size());
    if (end > begin) patterns.emplace_back(list.substr(begin, end - begin));
    begin = end + 1;
  }
  if (list.find('\0') != std::string_view::npos) return "has a character that no name has";
  if (names.veto.size() + names.hide.size() > kPatternsMax) {
    return "has over " + std::to_string(kPatternsMax) + " patterns";
  }
  const bool too_long = BytesOf(names.veto) + BytesOf(names.hide) > kPatternBytesMax;
  return too_long ? "is over " + std::to_string(kPatternBytesMax >> 10) + " KiB long" : std::string();
}

/// Newer versions of Samba have lists for single users and groups: "veto files:ann".
std::string SambaListProblem(const SmbConf& conf, const std::string& section, const std::string& parameter,
                             ShareNames& names, std::vector<std::string>& patterns) {
  const std::string rule = "Samba's rule \"" + parameter + "\" ";
  if (conf.HasBeginning(section, parameter + ":")) return rule + "differs from user to user";
  const std::string list = conf.Written(section, parameter).value_or("");
  if (list.find('%') != std::string::npos) return rule + "has a macro";
  const std::string problem = TakePatterns(list, names, patterns);
  return problem.empty() ? problem : rule + problem;
}

}  // namespace

std::string ReadNames(const Json::Value& object, ShareNames& names) {
  const std::pair<const char*, std::vector<std::string>*> lists[] = {{"veto_files", &names.veto},
                                                                     {"hide_files", &names.hide}};
  for (const auto& [member, patterns] : lists) {
    std::string list;
    const bool read = ReadMember(object, member, list);
    const bool enclosed = list.size() > 1 && list.front() == '/' && list.back() == '/';
    if (!read || !(list.empty() || enclosed)) return "has a member of the wrong type";
    const std::string problem = TakePatterns(list, names, *patterns);
    if (!problem.empty()) return std::string("has a member \"") + member + "\" that " + problem;
  }
  return {};
}

/// "case sensitive" is "auto" unless it is set, by which only some old clients get names as they are written.
ShareNames SambaNames(const SmbConf& conf, const std::string& section) {
  ShareNames names;
  names.case_counts = conf.IsOn(section, "case sensitive");
  std::string problem = SambaListProblem(conf, section, "veto files", names, names.veto);
  if (problem.empty()) problem = SambaListProblem(conf, section, "hide files", names, names.hide);
  if (!problem.empty()) names = {{}, {}, false, std::move(problem)};
  return names;
}

}  // namespace kova::host
