#include "services/kovaelasticd/text/manual_title.h"

#include <string_view>
#include <utility>

#include "services/kovaelasticd/text/lines.h"
#include "services/kovaelasticd/text/title.h"

namespace ferrox::engine {

namespace {

// Every manual page begins with a section of its name, whatever that is called in the page's language:
//
//     .SH NAME                          .Sh NAME
//     lsof \- list open files           .Nm ls
//                                       .Nd list directory contents

constexpr std::string_view kMacroBlanks = " \t";
/// The section may go on with paragraphs; a title ends there.
constexpr size_t kNameMaxBytes = 2000;

/// The name of a line's macro, which is taken off together with the blanks behind it; "" when it is none.
std::string_view TakeMacro(std::string_view& line) {
  if (line.empty() || (line[0] != '.' && line[0] != '\'')) return {};
  line.remove_prefix(std::min(line.size(), line.find_first_not_of(kMacroBlanks, 1)));
  const size_t end = std::min(line.size(), line.find_first_of(kMacroBlanks));
  const std::string_view macro = line.substr(0, end);
  line.remove_prefix(std::min(line.size(), line.find_first_not_of(kMacroBlanks, end)));
  return macro.empty() ? std::string_view(".") : macro;
}

/// How many bytes the name behind "\f", "\(" and their like has: "B", "(em", "[u2014]".
size_t EscapeNameBytes(std::string_view name) {
  if (name.empty()) return 0;
  if (name[0] == '(') return std::min<size_t>(name.size(), 3);
  if (name[0] == '[') return std::min(name.size(), name.find(']')) + (name.find(']') == name.npos ? 0 : 1);
  return 1;
}

/// What a named character stands for; those that are not listed are left out.
std::string_view NamedCharacter(std::string_view name) {
  constexpr std::pair<std::string_view, std::string_view> kNames[] = {
      {"en", "-"}, {"em", "-"},  {"mi", "-"},  {"hy", "-"},  {"aq", "'"}, {"cq", "'"},
      {"oq", "'"}, {"dq", "\""}, {"lq", "\""}, {"rq", "\""}, {"co", ""},  {"rs", "\\"},
  };
  while (!name.empty() && (name[0] == '(' || name[0] == '[')) name.remove_prefix(1);
  if (!name.empty() && name.back() == ']') name.remove_suffix(1);
  for (const auto& [key, value] : kNames) {
    if (key == name) return value;
  }
  return {};
}

/// Appends what the escape at the beginning of `text`, behind its backslash, prints; the number of bytes that it has.
size_t AppendEscape(std::string& out, std::string_view text) {
  if (text.empty()) return 0;
  switch (text[0]) {
    case '-':
      out += '-';
      return 1;
    case 'e':
      out += '\\';
      return 1;
    case ' ':
    case '~':
    case '0':
      out += ' ';
      return 1;
    case '"':
      return text.size();
    case '(':
    case '[': {
      const size_t bytes = EscapeNameBytes(text);
      out += NamedCharacter(text.substr(0, bytes));
      return bytes;
    }
    case 'f':
    case '*':
    case 'F':
    case 'm':
      return 1 + EscapeNameBytes(text.substr(1));
    case 's': {
      const size_t sign = text.size() > 1 && (text[1] == '-' || text[1] == '+') ? 1 : 0;
      return std::min(text.size(), 2 + sign);
    }
    default:
      break;
  }
  if (text[0] == '\'' || text[0] == '`') out += '\'';
  return 1;
}

/// Appends a line of text; a quotation mark of a macro's argument is left out.
void AppendRoff(std::string& out, std::string_view text, bool arguments) {
  for (size_t pos = 0; pos < text.size();) {
    const char c = text[pos++];
    if (c == '\\') {
      pos += AppendEscape(out, text.substr(pos));
    } else if (c != '"' || !arguments) {
      out += c;
    }
  }
}

/// Appends a line of the section, a macro's or plain. False when the section ends with it.
bool AppendNameLine(std::string& name, std::string_view line) {
  const std::string_view macro = TakeMacro(line);
  if (macro == "SH" || macro == "Sh" || macro == "SS" || macro == "Ss") return false;
  const bool text = macro.empty() || macro == "B" || macro == "I" || macro == "BR" || macro == "BI" || macro == "IR" ||
                    macro == "RB" || macro == "IB" || macro == "RI" || macro == "SM" || macro == "SB" ||
                    macro == "Nm" || macro == "Nd" || macro == "Xr" || macro == "Cm" || macro == "Li";
  if (!text) return name.empty() || (macro != "PP" && macro != "P" && macro != "LP" && macro != "sp");
  if (line.empty()) return true;
  if (!name.empty()) name += ' ';
  const size_t begin = name.size();
  if (macro == "Nd") name += "- ";
  AppendRoff(name, line, !macro.empty());
  // mdoc has signs as arguments of their own.
  for (size_t pos = begin; (pos = name.find(" ,", pos)) != name.npos;) name.erase(pos, 1);
  return name.size() < kNameMaxBytes;
}

/// Of many names, those are left out in favour of the description that do not fit before it.
std::string Shortened(std::string name) {
  const size_t dash = name.find(" - ");
  if (name.size() <= kTitleMaxBytes || dash == name.npos || name.size() - dash >= kTitleMaxBytes) return name;
  const size_t end = name.rfind(", ", kTitleMaxBytes - (name.size() - dash));
  return end >= dash ? name : name.substr(0, end) + name.substr(dash);
}

}  // namespace

std::string ManualTitle(std::string_view text) {
  if (text.empty() || (text[0] != '.' && text[0] != '\'' && text[0] != '\\')) return {};
  std::string name;
  bool inside = false;
  while (!text.empty()) {
    std::string_view line = TakeLine(text);
    if (inside) {
      if (!AppendNameLine(name, line)) break;
      continue;
    }
    const std::string_view macro = TakeMacro(line);
    inside = macro == "SH" || macro == "Sh";
  }
  return Shortened(std::move(name));
}

}  // namespace ferrox::engine
