#include "services/kovacontentextractd/readers/markup.h"

#include <algorithm>
#include <array>
#include <cstring>
#include <optional>

#include "services/kovacontentextractd/readers/code_pages.h"
#include "services/kovacontentextractd/readers/entities.h"
#include "services/kovacontentextractd/readers/markup_bytes.h"
#include "services/kovacontentextractd/readers/page_text.h"
#include "services/kovacontentextractd/readers/utf8.h"

namespace ferrox::extract {

namespace {

using namespace std::literals;

// A reader of tags, not of documents: no tree is built, since all that counts of an element is its name and whether it
// separates words. So anything that looks like markup can be read, in time proportional to its length: what is searched
// for ahead (the end of a comment, a closing quote) is searched for once, or remembered.

constexpr size_t kTitleMaxBytes = 1024;
constexpr size_t kMarkupAttributeMaxBytes = 64 * 1024;
/// Of a reference to a character, with "&" and ";".
constexpr size_t kMarkupReferenceMaxBytes = 32;
constexpr size_t kNotFound = std::string_view::npos;

/// Remembers where a byte comes next, so that asking again from further on does not search the same bytes again.
class NextByte {
 public:
  explicit NextByte(char wanted) : wanted_(wanted) {}

  /// The first place at or after `from`; the text's size when there is none.
  size_t Find(std::string_view text, size_t from) {
    if (!known_ || at_ < from) {
      const void* found = from < text.size() ? memchr(text.data() + from, wanted_, text.size() - from) : nullptr;
      at_ = found != nullptr ? static_cast<size_t>(static_cast<const char*>(found) - text.data()) : text.size();
      known_ = true;
    }
    return at_;
  }

 private:
  char wanted_;
  bool known_ = false;
  size_t at_ = 0;
};

/// Elements of HTML within a line: they do not separate words.
constexpr std::string_view kInline[] = {"a",      "abbr", "acronym", "b",  "bdi",  "bdo",   "big",  "cite",
                                        "code",   "del",  "dfn",     "em", "font", "i",     "ins",  "kbd",
                                        "mark",   "nobr", "q",       "s",  "samp", "small", "span", "strike",
                                        "strong", "sub",  "sup",     "tt", "u",    "var",   "wbr"};

bool IsInline(std::string_view name) {
  return std::find(std::begin(kInline), std::end(kInline), name) != std::end(kInline);
}

bool IsCell(std::string_view name) { return name == "td" || name == "th" || name == "img" || name == "input"; }

/// Reads one document. HTML and XML differ in what they forgive: HTML has names without case, elements within a line
/// and raw text in scripts; XML has prefixes, declarations within a document type, and "<" begins a tag anywhere.
class MarkupReader {
 public:
  MarkupReader(std::string_view source, size_t limit_bytes, bool html)
      : source_(source), html_(html), text_(limit_bytes), title_(kTitleMaxBytes) {}

  MarkupText Read() {
    while (at_ < source_.size() && !text_.Full()) {
      const size_t next = std::min(source_.find('<', at_), source_.size());
      AddCharacters(source_.substr(at_, next - at_));
      at_ = next;
      if (at_ < source_.size()) ReadMarkup();
    }
    MarkupText result;
    result.title = title_.Take();
    result.text = text_.Take();
    result.cut = text_.Full();
    return result;
  }

 private:
  /// A title that never ends is given up when it is long enough.
  PageText& Sink() {
    if (title_.Full()) in_title_ = false;
    return in_title_ ? title_ : text_;
  }

  /// What begins with the "<" at hand: a comment, raw characters, an instruction, a declaration, a tag, or a "<" that
  /// the writer should have escaped.
  void ReadMarkup() {
    const std::string_view rest = source_.substr(at_);
    if (rest.substr(0, 4) == "<!--"sv) return SkipPast("-->"sv);
    if (rest.substr(0, 9) == "<![CDATA["sv) return ReadCData();
    if (rest.substr(0, 2) == "<?"sv) return SkipPast(html_ ? ">"sv : "?>"sv);
    if (rest.substr(0, 2) == "<!"sv) return SkipDeclaration();
    const size_t name_at = rest.size() > 1 && rest[1] == '/' ? 2 : 1;
    const bool is_tag = rest.size() > name_at && (IsMarkupLetter(rest[name_at]) ||
                                                  (!html_ && (rest[name_at] == '_' || (rest[name_at] & 0x80) != 0)));
    if (is_tag) return ReadTag(name_at == 2);
    Sink().Add("<"sv);
    ++at_;
  }

  /// An end that never comes ends the document, once: it is not looked for again.
  void SkipPast(std::string_view end) {
    const size_t found = source_.find(end, at_);
    at_ = found == kNotFound ? source_.size() : found + end.size();
  }

  /// Characters that are text as they are, up to "]]>".
  void ReadCData() {
    const size_t begin = at_ + "<![CDATA["sv.size();
    const size_t end = source_.find("]]>"sv, begin);
    Sink().Add(source_.substr(begin, end == kNotFound ? kNotFound : end - begin));
    at_ = end == kNotFound ? source_.size() : end + 3;
  }

  /// A document type, whose declarations in "[" and "]" are passed over unread.
  void SkipDeclaration() {
    char quote = '\0';
    bool inside = false;
    for (; at_ < source_.size(); ++at_) {
      const char c = source_[at_];
      if (quote != '\0') {
        if (c == quote) quote = '\0';
      } else if (!html_ && (c == '"' || c == '\'')) {
        quote = c;
      } else if (!html_ && c == '[') {
        inside = true;
      } else if (c == ']') {
        inside = false;
      } else if (c == '>' && !inside) {
        ++at_;
        return;
      }
    }
  }

  /// A tag's name, in lower case for HTML and without its prefix for XML; of a longer one, the first 24 bytes.
  void ReadTag(bool closing) {
    const size_t begin = at_ + (closing ? 2 : 1);
    size_t end = begin;
    std::array<char, 24> lower;
    while (end < source_.size() && IsMarkupNameByte(source_[end])) ++end;
    std::string_view name = source_.substr(begin, end - begin);
    if (!html_) name.remove_prefix(name.find(':') == kNotFound ? 0 : name.find(':') + 1);
    name = name.substr(0, lower.size());
    std::transform(name.begin(), name.end(), lower.begin(), [this](char c) { return html_ ? base::LowerAscii(c) : c; });
    at_ = end;
    const bool empty_element = SkipAttributes();
    Enter(std::string_view(lower.data(), name.size()), closing, empty_element);
  }

  /// Passes the attributes and the ">"; whether a "/" stood before it. Only behind a "=" does a quote begin a value: an
  /// apostrophe elsewhere is a mistake of its writer, or a part of a value without quotes.
  bool SkipAttributes() {
    char before = '\0';
    while (at_ < source_.size()) {
      const char c = source_[at_];
      if (c == '>') {
        ++at_;
        return source_[at_ - 2] == '/';
      }
      if (c == '<' && !html_) return false;  // the tag was not closed; the next one begins here
      ++at_;
      if (before == '=' && (c == '"' || c == '\'')) SkipQuoted(c);
      if (!IsHtmlBlank(c)) before = c;
    }
    return false;
  }

  /// A quote that is not closed within a reasonable length is none, unless the value is a whole file.
  void SkipQuoted(char quote) {
    const size_t close = (quote == '"' ? next_double_ : next_single_).Find(source_, at_);
    const bool is_file = StartsWithNoCase(source_.substr(at_), "data:"sv);
    if (close < source_.size() && (is_file || close - at_ <= kMarkupAttributeMaxBytes)) at_ = close + 1;
  }

  /// What an element's begin or end does to the text: opens or closes the title, drops what is not for people,
  /// separates words or lines.
  void Enter(std::string_view name, bool closing, bool empty_element) {
    if (name == "title"sv) {
      in_title_ = !closing && !empty_element && title_.Empty();
    } else if (html_ && !closing && (name == "script"sv || name == "style"sv)) {
      SkipRawText(name);
    } else if (!html_ && !closing && !empty_element && name == "binary"sv) {
      SkipRawText(name);  // pictures inside of e-books
    }
    if (html_ && IsInline(name)) return;
    Sink().Separate(!html_ || IsCell(name) ? ' ' : '\n');
  }

  /// Passes everything up to the element's closing tag; without one, to the end.
  void SkipRawText(std::string_view name) {
    while (at_ < source_.size()) {
      at_ = std::min(source_.find("</"sv, at_), source_.size());
      if (at_ == source_.size() || StartsWithNoCase(source_.substr(at_ + 2), name)) return;
      at_ += 2;
    }
  }

  /// Text between tags, with its references resolved.
  void AddCharacters(std::string_view characters) {
    PageText& sink = Sink();
    while (!characters.empty()) {
      const size_t reference = std::min(characters.find('&'), characters.size());
      sink.Add(characters.substr(0, reference));
      characters.remove_prefix(reference);
      if (!characters.empty()) characters.remove_prefix(AddReference(characters, sink));
    }
  }

  /// Resolves the reference that the text begins with; returns its length. What is none stands for itself.
  size_t AddReference(std::string_view text, PageText& sink) const {
    const size_t end = text.substr(0, kMarkupReferenceMaxBytes).find(';');
    const uint32_t code_point = end == kNotFound ? 0 : Resolve(text.substr(1, end - 1));
    if (code_point == 0) {
      sink.Add("&"sv);
      return 1;
    }
    if (code_point == 0xA0) {
      sink.Separate(' ');
    } else {
      std::string character;
      AppendUtf8(character, code_point);
      sink.Add(character);
    }
    return end + 1;
  }

  /// The character of the reference `name`, without "&" and ";"; 0 when it is not known.
  uint32_t Resolve(std::string_view name) const {
    if (name.size() < 2 || name[0] != '#') return html_ ? HtmlEntity(name) : XmlEntity(name);
    const std::optional<uint32_t> number = ReferenceNumber(name);
    if (!number) return 0;
    // Numbers that are control characters in Unicode are written by programs that think in Windows-1252.
    if (html_ && *number >= 0x80 && *number < 0xA0) return FromWindows1252(static_cast<unsigned char>(*number));
    return *number < 0x20 ? ' ' : *number;
  }

  std::string_view source_;
  bool html_;
  size_t at_ = 0;
  PageText text_;
  PageText title_;
  bool in_title_ = false;
  // The next quotes of either kind, for attributes.
  NextByte next_double_{'"'};
  NextByte next_single_{'\''};
};

}  // namespace

MarkupText ReadHtml(std::string_view source, size_t limit_bytes) {
  return MarkupReader(source, limit_bytes, true).Read();
}

MarkupText ReadXml(std::string_view source, size_t limit_bytes) {
  return MarkupReader(source, limit_bytes, false).Read();
}

}  // namespace ferrox::extract
