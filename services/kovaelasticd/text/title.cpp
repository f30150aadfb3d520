#include "services/kovaelasticd/text/title.h"

#include <algorithm>
#include <cctype>
#include <utility>

#include "services/kovaelasticd/text/clean.h"
#include "services/kovaelasticd/text/lines.h"
#include "services/kovaelasticd/text/manual_title.h"
#include "services/kovaelasticd/text/title_line.h"

namespace ferrox::engine {

namespace {

// A title is looked for in the beginning of the text, line by line: in a manual page's source its first section; in a
// mail's source its subject; else the first line that is marked as a heading, or looks like a title before any prose.

constexpr size_t kTitleReadBytes = 16 << 10;
/// What of a line is looked at.
constexpr size_t kLineMaxBytes = 1 << 10;
/// A heading that comes later is one of a part.
constexpr int kHeadingLinesMax = 60;

std::string_view TrimLeft(std::string_view line) {
  line.remove_prefix(std::min(line.size(), line.find_first_not_of(" \t\f\v")));
  return line;
}

bool StartsWith(std::string_view text, std::string_view beginning) {
  return text.substr(0, beginning.size()) == beginning;
}

bool EqualsNoCase(std::string_view a, std::string_view b) {
  return std::equal(a.begin(), a.end(), b.begin(), b.end(), [](char x, char y) {
    return std::tolower(static_cast<unsigned char>(x)) == std::tolower(static_cast<unsigned char>(y));
  });
}

/// The value of "name: value", or of "name = value"; "" when the line is none.
std::string_view ValueOf(std::string_view line, std::string_view name, char sign) {
  if (!EqualsNoCase(line.substr(0, name.size()), name)) return {};
  const std::string_view rest = TrimLeft(line.substr(name.size()));
  return !rest.empty() && rest[0] == sign ? TrimLeft(rest.substr(1)) : std::string_view{};
}

/// The title in the fields that a page's source may begin with, between lines of "---" or "+++"; those are taken off.
std::string_view FrontMatterTitle(std::string_view& text) {
  std::string_view rest = text;
  const std::string_view fence = TakeLine(rest);
  if (fence != "---" && fence != "+++") return {};
  std::string_view title;
  while (!rest.empty()) {
    const std::string_view line = TakeLine(rest);
    if (line == fence) {
      text = rest;
      return title;
    }
    if (title.empty()) title = ValueOf(line, "title", fence[0] == '-' ? ':' : '=');
  }
  return {};
}

bool IsHeaderLine(std::string_view line) {
  const size_t colon = line.find(':');
  return colon != line.npos && colon > 1 &&
         std::all_of(line.begin(), line.begin() + static_cast<ptrdiff_t>(colon),
                     [](unsigned char c) { return std::isalnum(c) || c == '-'; });
}

/// The subject of a text that begins with the header of a mail.
std::string_view MailSubject(std::string_view text) {
  std::string_view subject;
  bool sender = false;
  for (bool first = true; !text.empty(); first = false) {
    const std::string_view line = TakeLine(text);
    if (first && StartsWith(line, "From ")) continue;
    if (line.empty()) break;
    if (line[0] == ' ' || line[0] == '\t') continue;
    if (!IsHeaderLine(line)) return {};
    sender = sender || !ValueOf(line, "From", ':').empty() || !ValueOf(line, "Message-ID", ':').empty();
    if (subject.empty()) subject = ValueOf(line, "Subject", ':');
  }
  return sender && subject.find("=?") == subject.npos ? subject : std::string_view{};
}

/// The text behind the "#" of a heading.
std::string_view HashHeading(std::string_view line) {
  const size_t level = std::min(line.size(), line.find_first_not_of('#'));
  if (level == 0 || level > 6 || level == line.size() || line[level] != ' ') return {};
  line = TrimLeft(line.substr(level));
  const size_t end = line.find_last_not_of('#');
  if (end == line.npos) return {};
  return end + 1 < line.size() && line[end] == ' ' ? line.substr(0, line.find_last_not_of(' ', end) + 1) : line;
}

/// The line below the section NAME of a formatted manual page, which has only blank lines and rules before it: "lsof -
/// list open files". `inside`: the text begins within the section.
std::string_view NameSection(std::string_view text, bool inside) {
  while (!text.empty()) {
    const std::string_view line = TrimLeft(TakeLine(text));
    if (line.empty() || LineKindOf(line) == LineKind::kRule) continue;
    if (!inside && EqualsNoCase(line, "name")) {
      inside = true;
      continue;
    }
    const bool named = line.find(" - ") != line.npos || line.find(" \xE2\x80\x93 ") != line.npos ||
                       line.find(" \xE2\x80\x94 ") != line.npos;
    return inside && named ? line : std::string_view{};
  }
  return {};
}

/// Goes through the text from its beginning.
class TitleSearch {
 public:
  TitleSearch(std::string_view text, std::string_view ext)
      : rest_(text),
        markdown_(ext == "md" || ext == "markdown" || ext == "mkd" || ext == "rmd"),
        prose_(IsCodeKind(ext)) {}

  std::string_view Find() {
    for (int lines = 0; !rest_.empty() && lines < kHeadingLinesMax; ++lines) {
      const std::string_view line = TakeLine(rest_).substr(0, kLineMaxBytes);
      const std::string_view title = TitleIn(line);
      if (!title.empty()) return title;
    }
    return {};
  }

 private:
  std::string_view TitleIn(std::string_view line) {
    const std::string_view bare = TrimLeft(line);
    const LineKind kind = LineKindOf(bare);
    const bool after_blank = std::exchange(after_blank_, kind == LineKind::kRule);
    if (bare.empty()) return {};
    std::string_view behind = rest_;
    const std::string_view next = TakeLine(behind);
    const std::string_view hash = HashHeading(line);
    if (!hash.empty() && (markdown_ || (!prose_ && line[1] == ' ' && next.empty() &&
                                        LineKindOf(WithoutMarkup(hash)) == LineKind::kTitle)))
      return hash;
    if (prose_ && !markdown_) return {};
    if (after_blank && !BeginsComment(bare) && HasLetters(bare) && IsUnderline(next, bare)) {
      return SectionOr(bare, behind);
    }
    if (prose_) return {};
    switch (kind) {
      case LineKind::kRule:
        return {};
      case LineKind::kSkipped:
        prose_ = line[0] == '#' || line[0] == '/' || line[0] == ';';  // settings or a program follow
        SkipParagraph();
        return {};
      case LineKind::kProse:
        break;
      case LineKind::kTitle:
        if (after_blank && EndsTitle(bare, TrimLeft(next))) return Labelled(SectionOr(bare, rest_));
        break;
    }
    prose_ = true;
    return {};
  }

  /// The heading, or the NAME below it when it is a manual page's: "NAME", "lsof(8)".
  static std::string_view SectionOr(std::string_view heading, std::string_view below) {
    const bool name = EqualsNoCase(heading, "name");
    if (!name && heading.back() != ')') return heading;
    const std::string_view found = NameSection(below, name);
    return found.empty() ? heading : found;
  }

  /// "Subject: fishing" is about fishing.
  static std::string_view Labelled(std::string_view line) {
    for (const std::string_view label : {"Subject", "Title", "Betreff", "Titel"}) {
      const std::string_view value = ValueOf(line, label, ':');
      if (!value.empty()) return value;
    }
    return line;
  }

  void SkipParagraph() {
    after_blank_ = true;
    while (!rest_.empty()) {
      if (TakeLine(rest_).empty()) return;
    }
  }

  std::string_view rest_;
  bool markdown_;
  bool prose_;  ///< only a heading can follow
  bool after_blank_ = true;
};

/// The title as it is shown: without marks, on one line, not too long.
std::string FinishTitle(std::string_view found) {
  const std::string plain = WithoutMarkup(found.substr(0, kLineMaxBytes));
  std::string title;
  AppendClean(title, plain);
  if (title.size() > kTitleMaxBytes) {
    size_t end = title.rfind(' ', kTitleMaxBytes);
    if (end == title.npos || end < kTitleMaxBytes / 2) end = kTitleMaxBytes;
    while (end > 0 && (static_cast<unsigned char>(title[end]) & 0xC0) == 0x80) --end;
    title.resize(end);
  }
  const size_t first = std::min(title.size(), title.find_first_not_of(' '));
  title.erase(title.find_last_not_of(' ') + 1);
  title.erase(0, first);
  return HasLetters(title) ? title : std::string();
}

}  // namespace

std::string TitleOf(std::string_view text, std::string_view ext) {
  text = text.substr(0, kTitleReadBytes);
  if (StartsWith(text, "\xEF\xBB\xBF")) text.remove_prefix(3);
  const std::string manual = ManualTitle(text);
  if (!manual.empty()) return FinishTitle(manual);
  std::string_view title = FrontMatterTitle(text);
  if (title.empty()) title = MailSubject(text);
  if (title.empty()) title = TitleSearch(text, ext).Find();
  return FinishTitle(title);
}

}  // namespace ferrox::engine
