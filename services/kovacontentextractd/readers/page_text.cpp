#include "services/kovacontentextractd/readers/page_text.h"

#include <algorithm>

#include "services/kovacontentextractd/readers/markup_bytes.h"
#include "services/kovacontentextractd/readers/utf8.h"

namespace ferrox::extract {

namespace {

/// The bytes of the blank at `at`, a no-break space among them; 0 when there is none.
size_t BlankLength(std::string_view text, size_t at) {
  if (IsHtmlBlank(text[at])) return 1;
  return text[at] == '\xC2' && at + 1 < text.size() && text[at + 1] == '\xA0' ? 2 : 0;
}

}  // namespace

void PageText::Add(std::string_view piece) {
  size_t word_at = 0;
  for (size_t at = 0; at < piece.size();) {
    const size_t blank = BlankLength(piece, at);
    if (blank == 0) {
      ++at;
      continue;
    }
    if (at > word_at) AddWord(piece.substr(word_at, at - word_at));
    Separate(piece[at] == '\n' ? '\n' : ' ');
    word_at = at += blank;
  }
  if (piece.size() > word_at) AddWord(piece.substr(word_at));
}

void PageText::AddWord(std::string_view word) {
  const size_t separator = separator_ != '\0' && !text_.empty() ? 1 : 0;
  if (text_.size() + separator + word.size() > limit_bytes_) {
    const size_t room = limit_bytes_ - std::min(limit_bytes_, text_.size() + separator);
    word = CutAtCharacter(word, room);
    full_ = true;
  }
  if (!word.empty()) {
    if (separator != 0) text_ += separator_;
    text_ += word;
  }
  separator_ = '\0';
}

}  // namespace ferrox::extract
