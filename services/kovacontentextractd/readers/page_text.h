#pragma once

#include <cstddef>
#include <string>
#include <string_view>
#include <utility>

namespace ferrox::extract {

/// Collects text as it is read off a page: each run of blanks is one blank or one line end, none stands at the begin or
/// the end, and no more than a limit is kept.
class PageText {
 public:
  explicit PageText(size_t limit_bytes) : limit_bytes_(limit_bytes) {}

  /// A piece of text in UTF-8. What is beyond the limit is dropped, at a character's border.
  void Add(std::string_view piece);
  /// What stands between the text so far and what follows, ' ' or '\n'; a line end wins over a blank.
  void Separate(char separator) {
    if (separator_ != '\n') separator_ = separator;
  }

  /// Whether something was dropped.
  bool Full() const { return full_; }
  bool Empty() const { return text_.empty(); }
  /// The text; call once, at the end.
  std::string Take() { return std::move(text_); }

 private:
  void AddWord(std::string_view word);

  size_t limit_bytes_;
  std::string text_;
  char separator_ = '\0';  ///< to be put before the next word; '\0' for none
  bool full_ = false;
};

}  // namespace ferrox::extract
