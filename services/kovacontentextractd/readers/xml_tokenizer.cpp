#include "services/kovacontentextractd/readers/xml_tokenizer.h"

#include <algorithm>
#include <cstring>

#include "services/kovacontentextractd/readers/utf8.h"

namespace ferrox::extract {

namespace {

using namespace std::literals;

// What is kept of each thing in a document; the rest is read and dropped.
constexpr size_t kNameMaxBytes = 128;
constexpr size_t kAttributeMaxBytes = 16U << 10;
constexpr size_t kAttributesMax = 64;
constexpr size_t kReferenceMaxBytes = 16;

bool IsBlank(char c) { return c == ' ' || c == '\t' || c == '\n' || c == '\r'; }

bool EndsName(char c) { return IsBlank(c) || c == '>' || c == '/' || c == '=' || c == '<'; }

/// Where the first of two characters is, the `near` one of which comes soon; the size of the text when neither is
/// there.
size_t FindEither(std::string_view text, char near, char other) {
  const std::string_view before = text.substr(0, text.find(near));
  return std::min(before.size(), before.find(other));
}

/// How many bytes at the end of `text` are a character of UTF-8 that is not complete.
size_t CutOffBytes(std::string_view text) {
  for (size_t back = 1; back <= std::min<size_t>(3, text.size()); ++back) {
    const auto byte = static_cast<unsigned char>(text[text.size() - back]);
    if ((byte & 0xC0) == 0x80) continue;
    const size_t length = byte >= 0xF0 ? 4 : byte >= 0xE0 ? 3 : byte >= 0xC0 ? 2 : 1;
    return length > back ? back : 0;
  }
  return 0;
}

/// The character of a numeric reference ("#233", "#xE9"); 0 when it is none that a text may have.
uint32_t NumericReference(std::string_view name) {
  const bool hex = name.size() > 1 && (name[1] == 'x' || name[1] == 'X');
  uint32_t code = 0;
  for (const char c : name.substr(hex ? 2 : 1)) {
    const char lower = static_cast<char>(c | 0x20);
    const bool digit = c >= '0' && c <= '9';
    if (!digit && !(hex && lower >= 'a' && lower <= 'f')) return 0;
    const auto value = static_cast<uint32_t>(digit ? c - '0' : lower - 'a' + 10);
    code = std::min<uint32_t>(code * (hex ? 16 : 10) + value, 0x110000);
  }
  return code > 0x10FFFF || (code >= 0xD800 && code <= 0xDFFF) ? 0 : code;
}

/// The character of a reference, without "&" and ";"; 0 for an entity that a document type would have to define.
uint32_t Reference(std::string_view name) {
  if (name == "amp"sv) return '&';
  if (name == "lt"sv) return '<';
  if (name == "gt"sv) return '>';
  if (name == "quot"sv) return '"';
  if (name == "apos"sv) return '\'';
  return !name.empty() && name[0] == '#' ? NumericReference(name) : 0;
}

}  // namespace

XmlTokenizer::XmlTokenizer(ByteSource& source) : source_(source) {}

std::string_view XmlTokenizer::LocalName(std::string_view name) {
  const size_t colon = name.find(':');
  return colon == std::string_view::npos ? name : name.substr(colon + 1);
}

std::string_view XmlTokenizer::Attribute(std::string_view name) const {
  for (size_t i = 0; i < attribute_count_; ++i) {
    if (attributes_[i].name == name) return attributes_[i].value;
  }
  return {};
}

std::string_view XmlTokenizer::PrefixedAttribute(std::string_view local_name) const {
  for (size_t i = 0; i < attribute_count_; ++i) {
    const std::string& name = attributes_[i].name;
    if (name.size() > local_name.size() && LocalName(name) == local_name) return attributes_[i].value;
  }
  return {};
}

// --- the buffer: UTF-8 from begin_ to end_, refilled when less is left than a step needs. Views into it, such as Text,
// hold until the next refill.

/// Makes room and reads more; false when nothing more comes.
bool XmlTokenizer::Refill() {
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
void XmlTokenizer::DetectCharset() {
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
void XmlTokenizer::FillUtf16() {
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

/// Whether `count` more bytes are there, after a refill if need be.
bool XmlTokenizer::Has(size_t count) {
  while (end_ - begin_ < count) {
    if (!Refill()) return false;
  }
  return true;
}

bool XmlTokenizer::StartsWith(std::string_view text) {
  return Has(text.size()) && Rest().substr(0, text.size()) == text;
}

/// Passes everything up to `end` and that; what may be the beginning of it is kept when the buffer is refilled.
bool XmlTokenizer::SkipPast(std::string_view end) {
  while (Has(end.size())) {
    const size_t found = Rest().find(end);
    if (found != std::string_view::npos) {
      begin_ += found + end.size();
      return true;
    }
    begin_ = end_ - (end.size() - 1);
  }
  begin_ = end_;
  return false;
}

void XmlTokenizer::SkipBlanks() {
  while (Has(1) && IsBlank(buffer_[begin_])) ++begin_;
}

// --- the tokens: each of these functions is called with the first byte of its token at begin_, and leaves what follows
// it there.

XmlTokenizer::Token XmlTokenizer::Bad() {
  bad_ = true;
  return Token::kBad;
}

XmlTokenizer::Token XmlTokenizer::Next() {
  for (;;) {
    if (bad_) return Token::kBad;
    if (close_pending_) return CloseElement();
    if (!Has(1)) return Token::kEnd;
    Token token;
    if (in_cdata_) {
      token = ReadCData();
    } else if (buffer_[begin_] == '<') {
      token = ReadMarkup();
    } else {
      token = buffer_[begin_] == '&' ? ReadReference() : ReadText();
    }
    if (token != Token::kText || !text_.empty()) return token;
  }
}

bool XmlTokenizer::Next(Token& token) {
  token = Next();
  return token != Token::kEnd && token != Token::kBad;
}

void XmlTokenizer::SkipElement() {
  const int outside = depth_ - 1;
  for (Token token; depth_ > outside && Next(token);) continue;
}

/// Text up to the next tag or reference, or what the buffer has of it.
XmlTokenizer::Token XmlTokenizer::ReadText() {
  const std::string_view rest = Rest();
  const size_t size = FindEither(rest, '<', '&');
  return TakeText(size == rest.size() ? size - CutOffBytes(rest) : size);
}

/// Hands out that much of the buffer. When that is nothing, there must be more to come; else all that is left.
XmlTokenizer::Token XmlTokenizer::TakeText(size_t size) {
  if (size == 0 && Refill()) return Next();
  text_ = Rest().substr(0, size == 0 ? std::string_view::npos : size);
  begin_ += text_.size();
  return Token::kText;
}

/// Appends the character of the reference that comes next; returns its length, 0 when it is none.
size_t XmlTokenizer::Resolve(std::string& out) {
  (void)Has(kReferenceMaxBytes);
  const size_t end = Rest().substr(0, kReferenceMaxBytes).find(';');
  if (end == std::string_view::npos) return 0;
  const uint32_t code = Reference(Rest().substr(1, end - 1));
  if (code != 0) AppendUtf8(out, code);
  return end + 1;
}

XmlTokenizer::Token XmlTokenizer::ReadReference() {
  reference_.clear();
  const size_t length = Resolve(reference_);
  if (length == 0) reference_.push_back('&');
  begin_ += std::max<size_t>(length, 1);
  text_ = reference_;
  return Token::kText;
}

/// Text as it is, up to "]]>", or what the buffer has of it.
XmlTokenizer::Token XmlTokenizer::ReadCData() {
  (void)Has(4);
  const std::string_view rest = Rest();
  const size_t end = rest.find("]]>"sv);
  if (end != std::string_view::npos) {
    text_ = rest.substr(0, end);
    begin_ += end + 3;
    in_cdata_ = false;
    return Token::kText;
  }
  const std::string_view safe =
      rest.substr(0, rest.size() - std::min<size_t>(rest.size(), 2));  // an end may have begun
  return TakeText(safe.size() - CutOffBytes(safe));
}

/// What begins with "<". Comments, instructions and the document type are no tokens: an empty text stands for them,
/// which Next passes over.
XmlTokenizer::Token XmlTokenizer::ReadMarkup() {
  text_ = {};
  if (Has(2) && buffer_[begin_ + 1] != '!' && buffer_[begin_ + 1] != '?') return ReadTag();
  if (StartsWith("<!--"sv)) {
    (void)SkipPast("-->"sv);
  } else if (StartsWith("<![CDATA["sv)) {
    begin_ += 9;
    in_cdata_ = true;
  } else if (StartsWith("<!"sv)) {
    (void)SkipDocumentType();
  } else if (StartsWith("<?"sv)) {
    (void)SkipPast("?>"sv);
  } else {
    return ReadTag();
  }
  return Token::kText;
}

/// Passes a document type with its declarations in brackets, none of which is read: no entity can expand to anything.
bool XmlTokenizer::SkipDocumentType() {
  char quote = '\0';
  bool inside = false;
  for (; Has(1); ++begin_) {
    const char c = buffer_[begin_];
    if (quote != '\0') {
      if (c == quote) quote = '\0';
    } else if (c == '"' || c == '\'') {
      quote = c;
    } else if (c == '[' || c == ']') {
      inside = c == '[';
    } else if (c == '>' && !inside) {
      ++begin_;
      return true;
    }
  }
  return false;
}

/// A tag with its attributes. "<a/>" is a kOpen, and a kClose that close_pending_ stands for. A tag that another "<"
/// cuts off counts as ended there.
XmlTokenizer::Token XmlTokenizer::ReadTag() {
  ++begin_;
  if (!Has(1)) return Token::kEnd;
  const bool closing = buffer_[begin_] == '/';
  if (closing) ++begin_;
  attribute_count_ = 0;
  ReadName(name_);
  if (name_.empty()) return Bad();
  while (Has(1) && buffer_[begin_] != '>' && buffer_[begin_] != '<') {
    if (buffer_[begin_] == '/' || IsBlank(buffer_[begin_])) {
      close_pending_ = buffer_[begin_] == '/';
      ++begin_;
    } else {
      close_pending_ = false;
      ReadAttribute();
    }
  }
  if (!Has(1)) {
    close_pending_ = false;
    return Token::kEnd;
  }
  if (buffer_[begin_] == '>') ++begin_;
  if (closing) return CloseElement();
  return ++depth_ > kDepthMax ? Bad() : Token::kOpen;
}

XmlTokenizer::Token XmlTokenizer::CloseElement() {
  close_pending_ = false;
  attribute_count_ = 0;
  return --depth_ < 0 ? Bad() : Token::kClose;
}

void XmlTokenizer::ReadName(std::string& name) {
  name.clear();
  while (Has(1) && !EndsName(buffer_[begin_])) {
    const std::string_view rest = Rest();
    const auto size = static_cast<size_t>(std::find_if(rest.begin(), rest.end(), &EndsName) - rest.begin());
    name.append(rest.substr(0, std::min(size, kNameMaxBytes - name.size())));
    begin_ += size;
  }
}

/// Name, "=", quoted value; a value without quotes is left out. The strings of earlier tags are used again, so that
/// reading attributes does not allocate.
void XmlTokenizer::ReadAttribute() {
  if (attribute_count_ == attributes_.size()) attributes_.emplace_back();
  NamedValue& attribute = attributes_[attribute_count_];
  attribute.value.clear();
  ReadName(attribute.name);
  if (attribute_count_ + 1 < kAttributesMax) ++attribute_count_;  // further ones overwrite the last
  SkipBlanks();
  if (!Has(1) || buffer_[begin_] != '=') return;
  ++begin_;
  SkipBlanks();
  if (!Has(1)) return;
  const char quote = buffer_[begin_];
  if (quote != '"' && quote != '\'') return;
  ++begin_;
  ReadValue(quote, attribute.value);
}

void XmlTokenizer::ReadValue(char quote, std::string& value) {
  while (Has(1) && buffer_[begin_] != quote) {
    const std::string_view rest = Rest();
    size_t length = 1;
    if (rest[0] == '&') {
      std::string character;
      length = std::max<size_t>(Resolve(character), 1);
      if (value.size() < kAttributeMaxBytes) value += character;
    } else {
      length = FindEither(rest, quote, '&');
      value.append(rest.substr(0, std::min(length, kAttributeMaxBytes - std::min(kAttributeMaxBytes, value.size()))));
    }
    begin_ += length;
  }
  if (Has(1)) ++begin_;
}

}  // namespace ferrox::extract
