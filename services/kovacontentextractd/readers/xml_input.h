#pragma once

#include <array>
#include <cstddef>
#include <string_view>

#include "services/kovacontentextractd/readers/byte_source.h"
#include "services/kovacontentextractd/readers/markup_bytes.h"

namespace ferrox::extract {

/// The characters of an XML document as UTF-8, a window of them at a time: UTF-8 as it is, and UTF-16 with a byte order
/// mark or by its first character, converted. The window moves on when more is asked for than is left in it; views into
/// it end then.
class XmlInput {
 public:
  /// `source` must outlive this; it is read as characters are asked for.
  explicit XmlInput(ByteSource& source) : source_(source) {}
  XmlInput(const XmlInput&) = delete;
  XmlInput& operator=(const XmlInput&) = delete;

  /// What the window has of what was not passed yet. Valid until a call that may move it on: all below but Pass.
  std::string_view Rest() const { return {buffer_.data() + begin_, end_ - begin_}; }
  /// The next byte, where Has(1).
  char Front() const { return buffer_[begin_]; }
  /// Passes bytes of Rest.
  void Pass(size_t count) { begin_ += count; }

  /// Whether `count` more bytes are there, after a refill if need be. At most a few: the window must hold them.
  bool Has(size_t count) { return end_ - begin_ >= count || RefillTo(count); }
  /// Makes room and reads more; false when nothing more comes.
  bool Refill();
  bool StartsWith(std::string_view text) { return Has(text.size()) && Rest().starts_with(text); }
  /// Passes everything up to `end` and that; all that is left, when it does not come.
  void SkipPast(std::string_view end);
  void SkipBlanks() {
    while (Has(1) && IsXmlBlank(Front())) Pass(1);
  }

 private:
  enum class Charset { kUnknown, kUtf8, kUtf16Little, kUtf16Big };

  bool RefillTo(size_t count);
  void DetectCharset();
  void FillUtf16();

  ByteSource& source_;
  Charset charset_ = Charset::kUnknown;
  std::array<char, 16384> buffer_;  ///< UTF-8; what is not passed lies from begin_ to end_
  std::array<char, 4096> wide_;     ///< UTF-16 that is not converted yet
  size_t wide_size_ = 0;
  size_t begin_ = 0, end_ = 0;
  bool source_ended_ = false;
};

}  // namespace ferrox::extract
