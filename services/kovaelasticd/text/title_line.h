#pragma once

#include <cstdint>
#include <string>
#include <string_view>

/// What one line near the beginning of a text can be to its title. Lines have no blanks at their ends.
namespace ferrox::engine {

enum class LineKind : uint8_t {
  kRule,     ///< empty, or decoration such as "-----": it only separates
  kSkipped,  ///< begins a paragraph that says nothing: a notice of rights, a picture, a comment, a date
  kProse,    ///< no title, and none of the plain lines behind it is
  kTitle,    ///< could be a title: short, of letters for the most part
};
LineKind LineKindOf(std::string_view line);

/// Whether a line that looks like a title ends there, and is not the first of a paragraph.
bool EndsTitle(std::string_view line, std::string_view next);

/// Whether `line` underlines the heading `above`.
bool IsUnderline(std::string_view line, std::string_view above);

/// Whether it begins as comments of programs, settings, pages or reStructuredText do.
bool BeginsComment(std::string_view line);

/// Whether there are at least two letters in it.
bool HasLetters(std::string_view text);

/// Whether files of this kind are programs, tables or settings, whose first line is no title.
bool IsCodeKind(std::string_view ext);

/// The text without the marks of Markdown and HTML: `[text](url)`, `**text**`, `<b>text</b>`.
std::string WithoutMarkup(std::string_view text);

}  // namespace ferrox::engine
