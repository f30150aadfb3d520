#include "platform/host/smb_conf.h"

#include <algorithm>
#include <iterator>
#include <unordered_set>
#include <utility>

#include "base/text.h"

namespace kova::host {

namespace {

constexpr char kGlobal[] = "global";
constexpr char kNoSection[] = "\n";  // the name of none: a name has no line feed

bool IsBlank(char c) { return c == ' ' || (c >= '\t' && c <= '\r'); }

/// Whether only blanks stand between `at` and the end of its line, that is whether a "\" before `at` continues it.
bool IsLineEnd(const std::string& text, size_t at) {
  while (at < text.size() && text[at] != '\n' && IsBlank(text[at])) ++at;
  return at < text.size() && text[at] == '\n';
}

/// Without the "\" of continued lines, each run of blanks as one, none at the ends.
std::string CollapseBlanks(const std::string& text) {
  std::string out;
  for (size_t i = 0; i < text.size(); ++i) {
    const bool blank = IsBlank(text[i]) || (text[i] == '\\' && IsLineEnd(text, i + 1));
    if (!blank) {
      out += text[i];
    } else if (!out.empty() && out.back() != ' ') {
      out += ' ';
    }
  }
  if (!out.empty() && out.back() == ' ') out.pop_back();
  return out;
}

std::string FoldParameter(const std::string& name) {
  std::string out;
  for (const char c : CollapseBlanks(name)) {
    if (c != ' ') out += base::LowerAscii(c);
  }
  return out;
}

std::string ValueKey(const std::string& folded_section, const std::string& folded_parameter) {
  return folded_section + "\n" + folded_parameter;
}

}  // namespace

SmbConf::SmbConf(std::string text) : text_(std::move(text)) { Parse(); }

std::string SmbConf::Fold(const std::string& section) { return base::LowerAscii(CollapseBlanks(section)); }

std::optional<bool> SmbConf::Boolean(const std::string& value) {
  const std::string folded = FoldParameter(value);
  for (const char* yes : {"yes", "true", "1", "on"}) {
    if (folded == yes) return true;
  }
  for (const char* no : {"no", "false", "0", "off"}) {
    if (folded == no) return false;
  }
  return {};
}

void SmbConf::Parse() {
  size_t at = 0;
  while (at < text_.size()) {
    if (IsBlank(text_[at])) {
      ++at;
    } else if (text_[at] == '#' || text_[at] == ';') {
      at = std::min(text_.find('\n', at), text_.size());
    } else {
      at = text_[at] == '[' ? TakeHeader(at) : TakeParameter(at);
    }
  }
}

/// Where a line that may be continued ends: at a line feed, or where the text does.
size_t SmbConf::LogicalEnd(size_t begin) const {
  for (;;) {
    const size_t end = text_.find('\n', begin);
    if (end == std::string::npos) return text_.size();
    size_t last = end;
    while (last > begin && IsBlank(text_[last - 1])) --last;
    if (last == begin || text_[last - 1] != '\\') return end;
    begin = end + 1;
  }
}

/// Where `wanted` is between `begin` and `end`; `end` when it is not.
size_t SmbConf::FindBefore(size_t end, char wanted, size_t begin) const {
  const char* found = std::find(text_.data() + begin, text_.data() + end, wanted);
  return static_cast<size_t>(found - text_.data());
}

/// Takes the header at `begin`. What follows a header without its "]" belongs to no section.
size_t SmbConf::TakeHeader(size_t begin) {
  const size_t end = LogicalEnd(begin), close = FindBefore(end, ']', begin);
  section_ = kNoSection;
  if (close == end) return end;
  const std::string name = CollapseBlanks(text_.substr(begin + 1, close - begin - 1));
  const size_t next = std::min(text_.find('\n', close), text_.size());
  section_ = Fold(name);
  if (headers_.emplace(section_, lines_.size()).second) sections_.push_back(name);
  lines_.push_back({section_, "", "", begin, begin, close, close, next});
  return next;
}

size_t SmbConf::TakeParameter(size_t begin) {
  const size_t end = LogicalEnd(begin), equals = FindBefore(end, '=', begin);
  if (equals == end) return end;
  size_t indent_begin = begin, value_begin = equals + 1, value_end = end;
  while (indent_begin > 0 && (text_[indent_begin - 1] == ' ' || text_[indent_begin - 1] == '\t')) --indent_begin;
  while (value_end > value_begin && IsBlank(text_[value_end - 1])) --value_end;
  while (value_begin < value_end && IsBlank(text_[value_begin])) ++value_begin;
  const std::string name = FoldParameter(text_.substr(begin, equals - begin));
  const std::string value = CollapseBlanks(text_.substr(value_begin, end - value_begin));
  values_[ValueKey(section_, name)].push_back(lines_.size());
  lines_.push_back({section_, name, value, indent_begin, begin, value_begin, value_end, end});
  return end;
}

bool SmbConf::HasSection(const std::string& section) const { return headers_.count(Fold(section)) != 0; }

/// The line whose value holds in a section; null when there is none.
const SmbConf::Line* SmbConf::Find(const std::string& section, const std::string& parameter) const {
  const std::string name = FoldParameter(parameter), folded = Fold(section);
  const auto own = values_.find(ValueKey(folded, name));
  if (own != values_.end()) return &lines_[own->second.back()];
  const auto global = values_.find(ValueKey(kGlobal, name));
  const auto header = headers_.find(folded);
  if (global == values_.end() || header == headers_.end()) return nullptr;
  const auto above = std::lower_bound(global->second.begin(), global->second.end(), header->second);
  return above == global->second.begin() ? nullptr : &lines_[*std::prev(above)];
}

std::optional<std::string> SmbConf::Get(const std::string& section, const std::string& parameter) const {
  const Line* const line = Find(section, parameter);
  return line != nullptr ? std::optional(line->value) : std::nullopt;
}

std::optional<std::string> SmbConf::Written(const std::string& section, const std::string& parameter) const {
  const Line* const line = Find(section, parameter);
  if (line == nullptr) return std::nullopt;
  return text_.substr(line->value_begin, line->value_end - line->value_begin);
}

bool SmbConf::HasBeginning(const std::string& section, const std::string& begin) const {
  const std::string folded = Fold(section), name = FoldParameter(begin);
  return std::any_of(lines_.begin(), lines_.end(), [&](const Line& line) {
    return line.name.starts_with(name) && (line.section == folded || line.section == kGlobal);
  });
}

bool SmbConf::IsOn(const std::string& section, const std::string& parameter) const {
  return Boolean(Get(section, parameter).value_or("no")).value_or(false);
}

std::vector<std::string> SmbConf::All(const std::string& parameter) const {
  const std::string name = FoldParameter(parameter);
  std::vector<std::string> values;
  for (const Line& line : lines_) {
    if (line.name == name) values.push_back(line.value);
  }
  return values;
}

/// The line that goes in after a header. Directly after it: a file that is included further down may begin sections of
/// its own.
std::string SmbConf::Insertion(size_t header, const std::string& parameter, bool on) const {
  const Line& line = lines_[header];
  std::string indent = "   ";
  if (header + 1 < lines_.size() && !lines_[header + 1].name.empty()) {
    const Line& next = lines_[header + 1];
    indent = text_.substr(next.indent_begin, next.begin - next.indent_begin);
  }
  const bool dos = line.next > 0 && text_[line.next - 1] == '\r';
  const std::string feed = dos ? "\r\n" : "\n";
  const std::string assignment = indent + parameter + (on ? " = yes" : " = no");
  return line.next < text_.size() ? assignment + feed : feed + assignment + feed;
}

std::string SmbConf::WithSwitch(const std::vector<std::string>& sections, const std::string& parameter, bool on) const {
  struct Edit {
    size_t begin, end;
    std::string text;
  };
  std::unordered_set<std::string> without_value;  // sections to change in which no line is changed yet
  for (const std::string& section : sections) {
    if (HasSection(section) && IsOn(section, parameter) != on) without_value.insert(Fold(section));
  }
  const std::unordered_set<std::string> changing = without_value;
  const std::string name = FoldParameter(parameter);
  std::vector<Edit> edits;
  for (const Line& line : lines_) {
    if (line.name != name || changing.count(line.section) == 0) continue;
    (void)without_value.erase(line.section);
    const bool glued = text_[line.value_begin - 1] == '=';
    edits.push_back({line.value_begin, line.value_end, std::string(glued ? " " : "") + (on ? "yes" : "no")});
  }
  for (const std::string& section : without_value) {
    const size_t header = headers_.at(section), at = std::min(lines_[header].next + 1, text_.size());
    edits.push_back({at, at, Insertion(header, parameter, on)});
  }
  std::sort(edits.begin(), edits.end(), [](const Edit& a, const Edit& b) { return a.begin > b.begin; });
  std::string text = text_;
  for (const Edit& edit : edits) (void)text.replace(edit.begin, edit.end - edit.begin, edit.text);
  return text;
}

}  // namespace kova::host
