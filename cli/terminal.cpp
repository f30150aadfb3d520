#include "cli/terminal.h"

#include <sys/ioctl.h>
#include <unistd.h>
#include <wchar.h>

#include <algorithm>
#include <array>
#include <climits>
#include <cstdio>
#include <cstdlib>
#include <cstring>

#include "base/text.h"

namespace ferrox::cli {

namespace {

std::string Environment(const char* name) {
  const char* value = getenv(name);
  return value == nullptr ? "" : value;
}

/// There is no way to ask a terminal. Those that do not know the sequence may show it, so that only those that say who
/// they are get one; within a multiplexer it is not known which terminal is behind.
bool KnowsLinks(const std::string& term) {
  if (!Environment("TMUX").empty() || term.compare(0, 6, "screen") == 0) return false;
  constexpr int kFirstVte = 5000;
  if (atoi(Environment("VTE_VERSION").c_str()) >= kFirstVte) return true;
  for (const char* of_one : {"KITTY_WINDOW_ID", "KONSOLE_VERSION", "WT_SESSION", "WEZTERM_PANE", "DOMTERM"}) {
    if (!Environment(of_one).empty()) return true;
  }
  for (const char* name : {"iTerm.app", "vscode", "ghostty", "WezTerm", "Hyper"}) {
    if (Environment("TERM_PROGRAM") == name) return true;
  }
  return term.compare(0, 4, "foot") == 0 || term.compare(0, 9, "alacritty") == 0 || term == "xterm-kitty";
}

/// The first character of a text that is not empty; a byte where it begins with none.
std::string_view FirstOf(std::string_view text) {
  return text.substr(0, std::max<size_t>(1, base::CharacterBytes(text)));
}

/// Characters of two columns (Chinese, emoji) and of none (accents of their own) are as the C library knows them, which
/// in the locale "C" it does not.
size_t WidthOfCharacter(std::string_view character) {
  if (character[0] == kMatchBegin || character[0] == kMatchEnd) return 0;
  if (character.size() == 1) return 1;
  constexpr std::array<unsigned char, 5> kLead = {0, 0, 0x1F, 0x0F, 0x07};
  auto code = static_cast<wchar_t>(static_cast<unsigned char>(character[0]) & kLead[character.size()]);
  for (const char byte : character.substr(1)) code = code << 6 | (byte & 0x3F);
  const int width = wcwidth(code);
  return width < 0 ? 1 : static_cast<size_t>(width);
}

/// Lines of at most so many columns.
class Lines {
 public:
  Lines(size_t columns, size_t indent) : columns_(std::max<size_t>(columns, 20)), indent_(indent), used_(indent) {}

  void AddWord(std::string_view word) {
    const size_t width = WidthOf(word);
    const bool is_first = used_ == indent_;
    if (!is_first && used_ + 1 + width > columns_) {
      Break();
    } else if (!is_first) {
      text_ += ' ';
      ++used_;
    }
    if (used_ + width > columns_) return AddBroken(word);
    text_ += word;
    used_ += width;
  }

  std::string Take() { return std::move(text_); }

 private:
  void Break() {
    text_ += "\n" + std::string(indent_, ' ');
    used_ = indent_;
  }

  void AddBroken(std::string_view word) {
    while (!word.empty()) {
      const std::string_view character = FirstOf(word);
      const size_t width = WidthOfCharacter(character);
      if (used_ + width > columns_) Break();
      text_ += character;
      used_ += width;
      word.remove_prefix(character.size());
    }
  }

  const size_t columns_;
  const size_t indent_;
  size_t used_;
  std::string text_;
};

/// The path of a file: URI, in which every byte that is not plain is "%XX".
std::string UriPath(const std::string& path) {
  constexpr char kPlain[] = "-._~/";
  std::string uri;
  for (const char byte : path) {
    const bool is_letter = (byte >= 'a' && byte <= 'z') || (byte >= 'A' && byte <= 'Z');
    if (is_letter || (byte >= '0' && byte <= '9') || (byte != '\0' && strchr(kPlain, byte) != nullptr)) {
      uri += byte;
      continue;
    }
    char escaped[4];
    (void)snprintf(escaped, sizeof(escaped), "%%%02X", static_cast<unsigned>(static_cast<unsigned char>(byte)));
    uri += escaped;
  }
  return uri;
}

std::string HostName() {
  char name[HOST_NAME_MAX + 1] = {};
  return gethostname(name, HOST_NAME_MAX) == 0 ? UriPath(name) : "localhost";
}

}  // namespace

Terminal Terminal::OfOutput() {
  Terminal terminal;
  terminal.is_there = isatty(STDOUT_FILENO) == 1;
  if (!terminal.is_there) return terminal;
  const std::string term = Environment("TERM");
  terminal.styles = Environment("NO_COLOR").empty() && !term.empty() && term != "dumb";
  terminal.links = terminal.styles && KnowsLinks(term);
  terminal.columns = ColumnsOf(STDOUT_FILENO);
  return terminal;
}

size_t ColumnsOf(int descriptor) {
  winsize size = {};
  return ioctl(descriptor, TIOCGWINSZ, &size) == 0 && size.ws_col > 0 ? size.ws_col : 80;
}

size_t WidthOf(std::string_view text) {
  size_t width = 0;
  while (!text.empty()) {
    const std::string_view character = FirstOf(text);
    width += WidthOfCharacter(character);
    text.remove_prefix(character.size());
  }
  return width;
}

std::string Wrapped(std::string_view text, size_t columns, size_t indent) {
  Lines lines(columns, indent);
  while (!text.empty()) {
    const size_t end = std::min(text.find(' '), text.size());
    if (end > 0) lines.AddWord(text.substr(0, end));
    text.remove_prefix(std::min(end + 1, text.size()));
  }
  return lines.Take();
}

std::string Linked(const std::string& path, const std::string& text) {
  constexpr char kEnd[] = "\033\\";
  return "\033]8;;file://" + HostName() + UriPath(path) + kEnd + text + "\033]8;;" + kEnd;
}

}  // namespace ferrox::cli
