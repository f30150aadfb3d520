#include "services/kovacontentextractd/readers/xml_tokenizer.h"

#include <algorithm>

#include "services/kovacontentextractd/readers/entities.h"
#include "services/kovacontentextractd/readers/utf8.h"

namespace ferrox::extract {

namespace {

using namespace std::literals;

// What is kept of each thing in a document; the rest is read and dropped.
constexpr size_t kNameMaxBytes = 128;
constexpr size_t kAttributeMaxBytes = 16U << 10;
constexpr size_t kAttributesMax = 64;
constexpr size_t kReferenceMaxBytes = 16;

bool EndsName(char c) { return IsXmlBlank(c) || c == '>' || c == '/' || c == '=' || c == '<'; }

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

/// The character of a reference, without "&" and ";"; 0 for an entity that a document type would have to define, and
/// for a number that no character has.
uint32_t CharacterOf(std::string_view name) {
  if (!name.starts_with('#')) return XmlEntity(name);
  const uint32_t code = ReferenceNumber(name).value_or(0);
  return code > 0x10FFFF || (code >= 0xD800 && code <= 0xDFFF) ? 0 : code;
}

}  // namespace

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

// --- the tokens: each of these functions is called with the first byte of its token next in the input, and leaves
// there what follows it.

XmlTokenizer::Token XmlTokenizer::Bad() {
  bad_ = true;
  return Token::kBad;
}

XmlTokenizer::Token XmlTokenizer::Next() {
  for (;;) {
    if (bad_) return Token::kBad;
    if (close_pending_) return CloseElement();
    if (!input_.Has(1)) return Token::kEnd;
    Token token;
    if (in_cdata_) {
      token = ReadCData();
    } else if (input_.Front() == '<') {
      token = ReadMarkup();
    } else {
      token = input_.Front() == '&' ? ReadReference() : ReadText();
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
  const std::string_view rest = input_.Rest();
  const size_t size = FindEither(rest, '<', '&');
  return TakeText(size == rest.size() ? size - CutOffBytes(rest) : size);
}

/// Hands out that much of the buffer. When that is nothing, there must be more to come; else all that is left.
XmlTokenizer::Token XmlTokenizer::TakeText(size_t size) {
  if (size == 0 && input_.Refill()) return Next();
  text_ = input_.Rest().substr(0, size == 0 ? std::string_view::npos : size);
  input_.Pass(text_.size());
  return Token::kText;
}

/// Appends the character of the reference that comes next; returns its length, 0 when it is none.
size_t XmlTokenizer::Resolve(std::string& out) {
  (void)input_.Has(kReferenceMaxBytes);
  const size_t end = input_.Rest().substr(0, kReferenceMaxBytes).find(';');
  if (end == std::string_view::npos) return 0;
  const uint32_t code = CharacterOf(input_.Rest().substr(1, end - 1));
  if (code != 0) AppendUtf8(out, code);
  return end + 1;
}

XmlTokenizer::Token XmlTokenizer::ReadReference() {
  reference_.clear();
  const size_t length = Resolve(reference_);
  if (length == 0) reference_.push_back('&');
  input_.Pass(std::max<size_t>(length, 1));
  text_ = reference_;
  return Token::kText;
}

/// Text as it is, up to "]]>", or what the buffer has of it.
XmlTokenizer::Token XmlTokenizer::ReadCData() {
  (void)input_.Has(4);
  const std::string_view rest = input_.Rest();
  const size_t end = rest.find("]]>"sv);
  if (end != std::string_view::npos) {
    text_ = rest.substr(0, end);
    input_.Pass(end + 3);
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
  if (input_.Has(2) && input_.Rest()[1] != '!' && input_.Rest()[1] != '?') return ReadTag();
  if (input_.StartsWith("<!--"sv)) {
    input_.SkipPast("-->"sv);
  } else if (input_.StartsWith("<![CDATA["sv)) {
    input_.Pass(9);
    in_cdata_ = true;
  } else if (input_.StartsWith("<!"sv)) {
    SkipDocumentType();
  } else if (input_.StartsWith("<?"sv)) {
    input_.SkipPast("?>"sv);
  } else {
    return ReadTag();
  }
  return Token::kText;
}

/// Passes a document type with its declarations in brackets, none of which is read: no entity can expand to anything.
void XmlTokenizer::SkipDocumentType() {
  char quote = '\0';
  bool inside = false;
  for (; input_.Has(1); input_.Pass(1)) {
    const char c = input_.Front();
    if (quote != '\0') {
      if (c == quote) quote = '\0';
    } else if (c == '"' || c == '\'') {
      quote = c;
    } else if (c == '[' || c == ']') {
      inside = c == '[';
    } else if (c == '>' && !inside) {
      return input_.Pass(1);
    }
  }
}

/// A tag with its attributes. "<a/>" is a kOpen, and a kClose that close_pending_ stands for. A tag that another "<"
/// cuts off counts as ended there.
XmlTokenizer::Token XmlTokenizer::ReadTag() {
  input_.Pass(1);
  if (!input_.Has(1)) return Token::kEnd;
  const bool closing = input_.Front() == '/';
  if (closing) input_.Pass(1);
  attribute_count_ = 0;
  ReadName(name_);
  if (name_.empty()) return Bad();
  while (input_.Has(1) && input_.Front() != '>' && input_.Front() != '<') {
    if (input_.Front() == '/' || IsXmlBlank(input_.Front())) {
      close_pending_ = input_.Front() == '/';
      input_.Pass(1);
    } else {
      close_pending_ = false;
      ReadAttribute();
    }
  }
  if (!input_.Has(1)) {
    close_pending_ = false;
    return Token::kEnd;
  }
  if (input_.Front() == '>') input_.Pass(1);
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
  while (input_.Has(1) && !EndsName(input_.Front())) {
    const std::string_view rest = input_.Rest();
    const auto size = static_cast<size_t>(std::find_if(rest.begin(), rest.end(), &EndsName) - rest.begin());
    name.append(rest.substr(0, std::min(size, kNameMaxBytes - name.size())));
    input_.Pass(size);
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
  input_.SkipBlanks();
  if (!input_.Has(1) || input_.Front() != '=') return;
  input_.Pass(1);
  input_.SkipBlanks();
  if (!input_.Has(1)) return;
  const char quote = input_.Front();
  if (quote != '"' && quote != '\'') return;
  input_.Pass(1);
  ReadValue(quote, attribute.value);
}

void XmlTokenizer::ReadValue(char quote, std::string& value) {
  while (input_.Has(1) && input_.Front() != quote) {
    const std::string_view rest = input_.Rest();
    size_t length = 1;
    if (rest[0] == '&') {
      std::string character;
      length = std::max<size_t>(Resolve(character), 1);
      if (value.size() < kAttributeMaxBytes) value += character;
    } else {
      length = FindEither(rest, quote, '&');
      value.append(rest.substr(0, std::min(length, kAttributeMaxBytes - std::min(kAttributeMaxBytes, value.size()))));
    }
    input_.Pass(length);
  }
  if (input_.Has(1)) input_.Pass(1);
}

}  // namespace ferrox::extract
