#include "platform/host/synonyms.h"

#include <algorithm>

#include <kova/content_extract.h>
#include <kova/instance.h>

#include "base/text.h"
#include "platform/host/files.h"
#include "platform/host/stat_cache.h"

namespace kova::host {

namespace {

constexpr size_t kInLineMax = 32;  ///< words and phrases
constexpr size_t kSynonymMaxBytes = 200;
constexpr size_t kProblemsMax = 20;
constexpr std::string_view kBlanks = " \t\r";

std::string_view Trimmed(std::string_view text) {
  const size_t begin = text.find_first_not_of(kBlanks);
  return begin == text.npos ? "" : text.substr(begin, text.find_last_not_of(kBlanks) + 1 - begin);
}

bool IsText(std::string_view text) {
  while (!text.empty()) {
    const size_t bytes = base::CharacterBytes(text);
    if (bytes == 0 || (base::ControlCodePoint(text.substr(0, bytes)) >= 0 && text.front() != '\t')) return false;
    text.remove_prefix(bytes);
  }
  return true;
}

/// Whether there is anything to look for.
bool HasLetter(std::string_view text) {
  return std::any_of(text.begin(), text.end(), [](char c) {
    return (c & 0x80) != 0 || (c >= '0' && c <= '9') || (base::LowerAscii(c) >= 'a' && base::LowerAscii(c) <= 'z');
  });
}

/// Returns what is wrong with the words.
std::string ReadWords(std::string_view text, std::vector<std::string>& words) {
  for (size_t begin = 0; begin <= text.size();) {
    const size_t end = std::min(text.find(',', begin), text.size());
    const std::string_view word = Trimmed(text.substr(begin, end - begin));
    begin = end + 1;
    if (!HasLetter(word)) return word.empty() ? "lacks a word beside a comma" : "has a word without a letter";
    if (word.size() > kSynonymMaxBytes) return "has a word of more than 200 bytes";
    words.emplace_back(word);
  }
  return words.size() > kInLineMax ? "has more than 32 words" : "";
}

std::string ReadRule(std::string_view line, SynonymRule& rule) {
  constexpr std::string_view kArrow = "=>";
  const size_t arrow = line.find(kArrow);
  if (arrow == line.npos) {
    std::string problem = ReadWords(line, rule.first);
    rule.second = rule.first;
    return problem.empty() && rule.first.size() < 2 ? "has one word alone" : problem;
  }
  const std::string_view right = Trimmed(line.substr(arrow + kArrow.size()));
  const std::string_view left = Trimmed(line.substr(0, arrow));
  if (right.empty() || left.empty()) return "lacks the words on one side of \"=>\"";
  if (right.find(kArrow) != right.npos) return "has more than one \"=>\"";
  std::string problem = ReadWords(left, rule.first);
  return problem.empty() ? ReadWords(right, rule.second) : problem;
}

void AddProblem(SynonymList& list, size_t line, const std::string& problem) {
  if (list.problems.size() < kProblemsMax) list.problems.push_back("line " + std::to_string(line) + " " + problem);
}

SynonymList LoadSynonyms(const std::string& path) {
  std::string text;
  struct stat info = {};
  const std::string problem = ReadTextFile(path, text, &info);
  SynonymList list;
  if (!problem.empty()) {
    list.problems.push_back("the file " + problem);
  } else if (text.size() > kSynonymsMaxBytes) {
    list.problems.emplace_back("the file has more than 64 KiB");
  } else {
    list = ReadSynonyms(text);
  }
  if (info.st_ino != 0) list.stamp = KOVA::CONTENT_EXTRACT::Stamp(info);
  return list;
}

}  // namespace

SynonymList ReadSynonyms(std::string_view text) {
  SynonymList list;
  size_t number = 0;
  for (size_t begin = 0; begin < text.size();) {
    const size_t end = std::min(text.find('\n', begin), text.size());
    std::string_view line = text.substr(begin, end - begin);
    begin = end + 1;
    if (++number > kSynonymsMaxLines) {
      AddProblem(list, number, "and what follows do not count: a list has at most 1,000 lines");
      break;
    }
    const bool is_text = IsText(Trimmed(line));
    line = Trimmed(line.substr(0, line.find('#')));
    if (line.empty()) continue;
    SynonymRule rule;
    const std::string problem = is_text ? ReadRule(line, rule) : "is not text in UTF-8";
    if (problem.empty()) {
      list.rules.push_back(std::move(rule));
    } else {
      AddProblem(list, number, problem);
    }
  }
  return list;
}

std::string SynonymsPath() { return InstanceRoot() + "/etc/kova/synonyms.conf"; }

std::shared_ptr<const SynonymList> GetSynonyms() {
  static auto* cache = new StatCache<SynonymList>;  // never freed, like the settings
  return cache->Get(SynonymsPath(), &LoadSynonyms);
}

}  // namespace kova::host
