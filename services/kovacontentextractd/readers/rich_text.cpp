#include "services/kovacontentextractd/readers/rich_text.h"

#include <algorithm>
#include <map>
#include <string>
#include <string_view>
#include <vector>

#include "services/kovacontentextractd/readers/byte_source.h"
#include "services/kovacontentextractd/readers/code_pages.h"
#include "services/kovacontentextractd/readers/rich_text_input.h"
#include "services/kovacontentextractd/readers/rich_text_words.h"
#include "services/kovacontentextractd/readers/times.h"
#include "services/kovacontentextractd/readers/utf8.h"

namespace ferrox::extract {

namespace {

using namespace std::literals;

// RTF is ASCII: groups in braces, control words ("\par", "\u8217", with an optional number and one blank that ends
// them), control symbols ("\~") and text. A group inherits the state of the one around it and gives it back at its
// end. Some words make their group a destination: the text in it is not the document's, but a font's name, a title, a
// picture. Characters outside ASCII are "\'e9", a byte in the code page of the present font, or "\u233", a number in
// UTF-16, followed by what programs without Unicode show instead ("\uc" says how many bytes). Bytes of one encoding
// are collected and converted together, since East Asian characters have two.

/// Groups within groups; more is an attack.
constexpr size_t kDepthMax = 2000;
constexpr size_t kFontsMax = 10000;
/// How much text is collected before it is handed on, and the longest text of a field.
constexpr size_t kRichPieceBytes = 32U << 10;
/// The processor time for one file. Pictures are most of a long file, written in hexadecimal digits.
constexpr std::chrono::milliseconds kRichCpuMax(1500);

using Target = RichTextTarget;

/// The state that a group has of its own.
struct Group {
  Target target = Target::kText;
  const char* field = nullptr;  ///< of kField
  int code_page = 1252;
  bool is_aside = false;     ///< a note, or another text that stands in the midst of a word but is not of it
  bool is_unicode = false;   ///< holds again, whole, what a group before it has in a code page
  int unicode_fallback = 1;  ///< characters behind a Unicode one, for programs that do not know it
};

/// Reads a file in one pass, with memory for the open groups and the table of fonts.
class RichTextReader {
 public:
  RichTextReader(const Source& source, Findings& findings)
      : input_(source, kRichCpuMax), findings_(findings), groups_(1) {}

  void Read() {
    for (int c = input_.Get(); c >= 0 && !done_; c = input_.Get()) {
      if (c == '{') {
        Open();
      } else if (c == '}') {
        Close();
      } else if (c == '\\') {
        ReadControl();
      } else if (c != '\r' && c != '\n') {
        input_.Unget();
        AddBytes(input_.GetText());
      }
    }
    FlushBytes();
    FlushText();
    if (input_.TimeIsUp()) findings_.MarkCut();
  }

 private:
  Group& Top() { return groups_.back(); }

  /// "{": the new group has the state of the one around it.
  void Open() {
    FlushBytes();
    if (groups_.size() == kDepthMax) return Stop("damaged");
    groups_.push_back(Top());
    Top().is_aside = false;
    optional_ = false;
  }

  /// "}": a field's text is complete where its destination ends.
  void Close() {
    FlushBytes();
    const Group closed = Top();
    if (groups_.size() > 1) groups_.pop_back();
    if (closed.is_aside) AddCharacter('\n');
    fallback_left_ = 0;
    if (closed.target != Target::kField || Top().target == Target::kField) return;
    if (closed.is_unicode) findings_.Set(closed.field, value_);
    if (!closed.is_unicode) findings_.Append(closed.field, value_);
    value_.clear();
  }

  /// What follows a "\": a byte in hexadecimal digits, a symbol, or a word with its number.
  void ReadControl() {
    const int c = input_.Get();
    if (c == '\'') {
      const int value = input_.ReadHexByte();
      const auto byte = static_cast<char>(value);
      if (value >= 0) AddBytes({&byte, 1});
    } else if (RichTextInput::BeginsWord(c)) {
      const RichTextInput::Word word = input_.ReadWord(c);
      Do(word.name, word.number);
    } else {
      ReadSymbol(c);
    }
  }

  void ReadSymbol(int c) {
    const auto byte = static_cast<char>(c);
    if (c == '\\' || c == '{' || c == '}') return AddBytes({&byte, 1});
    if (c == '~') return AddCharacter(' ');
    if (c == '_') return AddCharacter('-');
    if (c == '\r' || c == '\n') return AddCharacter('\n');
    if (c == '*') optional_ = true;
  }

  /// Does what a control word says. Those that only say what text looks like are not known here, and do nothing.
  void Do(std::string_view word, int number) {
    if (word == "u"sv) return AddUnicode(number);
    if (word == "uc"sv) {
      Top().unicode_fallback = std::clamp(number, 0, 100);
      return;
    }
    if (word == "bin"sv) return input_.Skip(number);  // a picture as it is, braces among its bytes
    if (word == "f"sv) return SelectFont(number);
    if (word == "fcharset"sv) return SetCharset(number);
    if (word == "ansicpg"sv) return SetCodePage(number);
    if (word == "mac"sv || word == "pc"sv) {
      ansi_code_page_ = Top().code_page = word == "pc"sv ? 437 : kMacRomanCodePage;
      return;
    }
    if (const uint32_t character = RichTextCharacter(word)) return AddCharacter(character);
    if (word == "creatim"sv) return ReadTime();
    if (word == "ud"sv) {
      Top().is_unicode = true;
      optional_ = false;
      return;
    }
    SetTarget(word);
  }

  /// A group that begins with "\*" and a word that we do not know is for others.
  void SetTarget(std::string_view word) {
    const RichTextDestination* found = FindRichTextDestination(word);
    const bool known = found != nullptr;
    if (!known && !optional_) return;
    optional_ = false;
    FlushBytes();
    const bool in_nothing = Top().target == Target::kNowhere && (!known || found->target != Target::kField);
    if (in_nothing) return;
    Top().target = known ? found->target : Target::kNowhere;
    Top().field = known ? found->field : nullptr;
    Top().is_aside = Top().target == Target::kText;
    if (Top().is_aside) AddCharacter('\n');
  }

  /// "\f": within the table the font that is described, elsewhere the one that the text is in.
  void SelectFont(int number) {
    FlushBytes();
    if (Top().target == Target::kFontTable) {
      font_ = number;
      return;
    }
    const auto found = fonts_.find(number);
    Top().code_page = found != fonts_.end() && found->second != 0 ? found->second : ansi_code_page_;
  }

  /// Programs that call their text both ANSI and Mac's have written ANSI.
  void SetCodePage(int number) {
    const bool is_ansi = number == kMacRomanCodePage && ansi_code_page_ != kMacRomanCodePage;
    if (number > 1) ansi_code_page_ = Top().code_page = is_ansi ? 1252 : number;
  }

  /// "\fcharset" of the font that is described; 0 and 1 stand for the document's own code page.
  void SetCharset(int charset) {
    if (Top().target == Target::kFontTable && fonts_.size() < kFontsMax) {
      fonts_[font_] = charset <= 1 ? ansi_code_page_ : CodePageOfCharset(charset);
    }
  }

  /// "\yr2024\mo3\dy1\hr12\min30" in the rest of the group.
  void ReadTime() {
    CivilTime time;
    std::string text;
    for (int c = input_.Get(); c >= 0 && c != '}' && text.size() < 200; c = input_.Get()) text += static_cast<char>(c);
    input_.Unget();
    const auto number = [&](std::string_view word) {
      const size_t at = text.find(word);
      int value = 0;
      for (size_t i = at + word.size(); at != std::string::npos && i < text.size() && value < 100000; ++i) {
        if (text[i] < '0' || text[i] > '9') break;
        value = value * 10 + (text[i] - '0');
      }
      return value;
    };
    time = {number("\\yr"), number("\\mo"), number("\\dy"), number("\\hr"), number("\\min"), 0};
    if (const auto seconds = ToSeconds(time)) findings_.SetInteger(field::kKOVAMDContentCreationDate, *seconds);
  }

  /// Text in the code page of the group.
  void AddBytes(std::string_view bytes) {
    const size_t dropped = std::min(fallback_left_, bytes.size());
    fallback_left_ -= dropped;
    bytes.remove_prefix(dropped);
    if (Top().target == Target::kNowhere || Top().target == Target::kFontTable) return;
    while (!bytes.empty()) {
      const size_t taken = std::min(bytes.size(), kRichPieceBytes - bytes_.size());
      bytes_ += bytes.substr(0, taken);
      bytes.remove_prefix(taken);
      if (bytes_.size() == kRichPieceBytes) FlushBytes();
    }
  }

  /// "\u": one unit of UTF-16; characters beyond U+FFFF are two of them.
  void AddUnicode(int number) {
    FlushBytes();
    const auto unit = static_cast<uint16_t>(number);  // written as a signed number
    fallback_left_ = static_cast<size_t>(Top().unicode_fallback);
    if ((unit & 0xFC00) == 0xD800) {
      high_surrogate_ = unit;
    } else if ((unit & 0xFC00) == 0xDC00 && high_surrogate_ != 0) {
      AddCharacter(0x10000 + ((high_surrogate_ & 0x3FFU) << 10) + (unit & 0x3FFU));
      high_surrogate_ = 0;
    } else {
      AddCharacter(unit);
    }
  }

  void AddCharacter(uint32_t code) {
    FlushBytes();
    std::string* out = Out();
    if (out != nullptr) AppendUtf8(*out, code);
    if (text_.size() >= kRichPieceBytes) FlushText();
  }

  /// Bytes become text when it is known that no more of their encoding follow.
  void FlushBytes() {
    if (bytes_.empty()) return;
    std::string* out = Out();
    if (out != nullptr) *out += FromCodePage(bytes_, Top().code_page);
    bytes_.clear();
    if (text_.size() >= kRichPieceBytes) FlushText();
  }

  /// Where the group's text goes; null when it is dropped.
  std::string* Out() {
    if (Top().target == Target::kText) return &text_;
    return Top().target == Target::kField && value_.size() < kRichPieceBytes ? &value_ : nullptr;
  }

  void FlushText() {
    if (!findings_.AddText(text_)) done_ = true;
    text_.clear();
  }

  void Stop(std::string_view reason) {
    findings_.Fail(reason);
    done_ = true;
  }

  RichTextInput input_;
  Findings& findings_;
  std::vector<Group> groups_;
  std::map<int, int> fonts_;  ///< their code pages
  int font_ = 0;              ///< the one in the table that is being read
  int ansi_code_page_ = 1252;
  bool optional_ = false;        ///< "\*" stood before: a word that is not known makes its group one to be dropped
  size_t fallback_left_ = 0;     ///< bytes that are to be dropped behind a "\u"
  uint32_t high_surrogate_ = 0;  ///< the first half of a character, while its second one is to come
  std::string bytes_;            ///< in the group's code page
  std::string text_;
  std::string value_;  ///< of a field
  bool done_ = false;
};

}  // namespace

void ReadRichText(const Source& source, Findings& findings) {
  if (FileBytes(source).ReadAt(0, 5) != "{\\rtf") return findings.Fail("damaged");
  RichTextReader(source, findings).Read();
}

}  // namespace ferrox::extract
