#include "services/kovacontentextractd/readers/rich_text_input.h"

#include <algorithm>
#include <cstdint>

namespace ferrox::extract {

namespace {

int HexDigit(int c) {
  if (c >= '0' && c <= '9') return c - '0';
  const int lower = c | 0x20;
  return lower >= 'a' && lower <= 'f' ? lower - 'a' + 10 : -1;
}

}  // namespace

void RichTextInput::Refill() {
  size_ = budget_.IsSpent() ? 0 : source_.Read(buffer_.data(), buffer_.size());
  at_ = 0;
}

std::string_view RichTextInput::GetText() {
  const char* begin = buffer_.data() + at_;
  const char* end = std::find_if(begin, static_cast<const char*>(buffer_.data()) + size_,
                                 [](char c) { return c == '{' || c == '}' || c == '\\' || c == '\r' || c == '\n'; });
  at_ += static_cast<size_t>(end - begin);
  return {begin, static_cast<size_t>(end - begin)};
}

void RichTextInput::Skip(int count) {
  if (count <= 0) return;
  const size_t here = std::min(static_cast<size_t>(count), size_ - at_);
  at_ += here;
  source_.Skip(static_cast<uint64_t>(count) - here);
}

RichTextInput::Word RichTextInput::ReadWord(int first) {
  Word word;
  size_t letters = 0;
  int next = first;
  for (; BeginsWord(next); next = Get()) {
    if (letters < name_.size()) name_[letters++] = static_cast<char>(next);
  }
  word.name = {name_.data(), letters};
  const bool negative = next == '-';
  if (negative) next = Get();
  int64_t number = 0;
  bool has_number = false;
  for (; next >= '0' && next <= '9'; next = Get()) {
    number = std::min<int64_t>(number * 10 + (next - '0'), INT32_MAX);
    has_number = true;
  }
  if (next >= 0 && next != ' ') Unget();
  if (has_number) word.number = static_cast<int>(negative ? -number : number);
  return word;
}

int RichTextInput::ReadHexByte() {
  const int high = HexDigit(Get()), low = HexDigit(Get());
  return high >= 0 && low >= 0 ? high * 16 + low : -1;
}

}  // namespace ferrox::extract
