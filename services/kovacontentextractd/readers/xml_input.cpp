#include "services/kovacontentextractd/readers/xml_input.h"

#include <cstring>
#include <string>

#include "services/kovacontentextractd/readers/utf8.h"

namespace ferrox::extract {

namespace {

using namespace std::literals;

}  // namespace

bool XmlInput::Refill() {
  if (source_ended_) return false;
  if (begin_ > 0) memmove(buffer_.data(), buffer_.data() + begin_, end_ - begin_);
  end_ -= begin_;
  begin_ = 0;
  const size_t before = end_;
  if (charset_ == Charset::kUnknown) DetectCharset();
  if (charset_ == Charset::kUtf8) {
    const size_t got = end_ < buffer_.size() ? source_.Read(buffer_.data() + end_, buffer_.size() - end_) : 0;
    source_ended_ = got == 0 && end_ < buffer_.size();
    end_ += got;
  } else {
    FillUtf16();
  }
  return end_ > before;
}

/// By the first bytes: a byte order mark, or "<" with a zero beside it. All else is read as UTF-8, which ASCII is too;
/// office files are nothing else, whatever their declaration says.
void XmlInput::DetectCharset() {
  while (wide_size_ < 4) {
    const size_t got = source_.Read(wide_.data() + wide_size_, 4 - wide_size_);
    if (got == 0) break;
    wide_size_ += got;
  }
  const std::string_view head(wide_.data(), wide_size_);
  const auto is = [&](std::string_view begin) { return head.substr(0, begin.size()) == begin; };
  charset_ = is("\xFF\xFE"sv) || is("<\0"sv)   ? Charset::kUtf16Little
             : is("\xFE\xFF"sv) || is("\0<"sv) ? Charset::kUtf16Big
                                               : Charset::kUtf8;
  if (charset_ != Charset::kUtf8) return;
  const std::string_view kept = is("\xEF\xBB\xBF"sv) ? head.substr(3) : head;
  memcpy(buffer_.data(), kept.data(), kept.size());
  end_ = kept.size();
}

/// Reads UTF-16 and appends it to the buffer as UTF-8. A unit of which only one byte has come, and the first half of a
/// pair, wait in wide_ for the rest.
void XmlInput::FillUtf16() {
  do {
    const size_t got = source_.Read(wide_.data() + wide_size_, wide_.size() - wide_size_);
    source_ended_ = got == 0;
    wide_size_ += got;
  } while (wide_size_ < 4 && !source_ended_);
  const auto unit = [this](size_t at) -> uint32_t {
    const auto a = static_cast<unsigned char>(wide_[at]), b = static_cast<unsigned char>(wide_[at + 1]);
    return charset_ == Charset::kUtf16Big ? static_cast<uint32_t>(a << 8 | b) : static_cast<uint32_t>(b << 8 | a);
  };
  size_t at = 0;
  std::string text;
  while (at + 2 <= wide_size_ && end_ + text.size() + 4 <= buffer_.size()) {
    uint32_t code = unit(at);
    if (code >= 0xD800 && code <= 0xDBFF) {
      if (at + 4 > wide_size_ && !source_ended_) break;  // its second half is still to come
      if (at + 4 <= wide_size_ && (unit(at + 2) & 0xFC00) == 0xDC00) {
        code = 0x10000 + ((code & 0x3FF) << 10) + (unit(at + 2) & 0x3FF);
        at += 2;
      }
    }
    at += 2;
    if (code != 0xFEFF && code != 0) AppendUtf8(text, code);
  }
  memmove(wide_.data(), wide_.data() + at, wide_size_ - at);
  wide_size_ -= at;
  memcpy(buffer_.data() + end_, text.data(), text.size());
  end_ += text.size();
}

bool XmlInput::RefillTo(size_t count) {
  while (end_ - begin_ < count) {
    if (!Refill()) return false;
  }
  return true;
}

/// What may be the beginning of `end` is kept when the buffer is refilled.
void XmlInput::SkipPast(std::string_view end) {
  while (Has(end.size())) {
    const size_t found = Rest().find(end);
    if (found != std::string_view::npos) return Pass(found + end.size());
    begin_ = end_ - (end.size() - 1);
  }
  begin_ = end_;
}

}  // namespace ferrox::extract
