#include "common/json_scan.h"

#include <algorithm>
#include <utility>

namespace ferrox {

namespace {

/// Goes through a text piece by piece.
class Scanner {
 public:
  explicit Scanner(std::string_view text) : text_(text) {}

  /// Whether the next character but blanks is `c`, which is then taken.
  bool Take(char c) {
    SkipBlanks();
    if (text_.empty() || text_.front() != c) return false;
    text_.remove_prefix(1);
    return true;
  }
  bool AtEnd() {
    SkipBlanks();
    return text_.empty();
  }
  /// The next value: a string, what brackets enclose, or all up to the next mark. Empty when there is none.
  std::string_view Value() {
    SkipBlanks();
    const std::string_view start = text_;
    size_t depth = 0;
    do {
      if (text_.empty()) break;
      const char c = text_.front();
      if (c == '"') {
        SkipString();
      } else if (c == '[' || c == '{') {
        ++depth;
        text_.remove_prefix(1);
      } else if (c == ']' || c == '}') {
        if (depth == 0) break;
        --depth;
        text_.remove_prefix(1);
      } else if (depth > 0) {
        text_.remove_prefix(std::min(text_.find_first_of("\"[]{}"), text_.size()));
      } else {
        text_.remove_prefix(std::min(text_.find_first_of(" \t\r\n,:\"[]{}"), text_.size()));
      }
    } while (depth > 0);
    return start.substr(0, start.size() - text_.size());
  }

 private:
  void SkipBlanks() { text_.remove_prefix(std::min(text_.find_first_not_of(" \t\r\n"), text_.size())); }
  void SkipString() {
    size_t at = 1;
    while (at < text_.size() && text_[at] != '"') at += text_[at] == '\\' ? 2 : 1;
    text_.remove_prefix(std::min(at + 1, text_.size()));
  }

  std::string_view text_;
};

/// Has `take` take each of what stands between the brackets, with commas between them.
template <typename TakeOne>
bool TakeAll(std::string_view text, const char (&brackets)[3], const TakeOne& take) {
  Scanner scanner(text);
  if (!scanner.Take(brackets[0])) return false;
  if (!scanner.Take(brackets[1])) {
    do {
      if (!take(scanner)) return false;
    } while (scanner.Take(','));
    if (!scanner.Take(brackets[1])) return false;
  }
  return scanner.AtEnd();
}

}  // namespace

size_t CountJsonValues(std::string_view text) {
  size_t count = 1;
  bool in_string = false;
  for (size_t i = 0; i < text.size(); ++i) {
    const char c = text[i];
    if (in_string && c == '\\') {
      ++i;
    } else if (c == '"') {
      in_string = !in_string;
    } else if (!in_string && (c == ',' || c == '[' || c == '{')) {
      ++count;
    }
  }
  return count;
}

std::optional<std::vector<JsonMember>> JsonMembers(std::string_view object, size_t most) {
  std::vector<JsonMember> members;
  const bool whole = TakeAll(object, "{}", [&members, most](Scanner& scanner) {
    const std::string_view name = scanner.Value();
    if (name.empty() || name.front() != '"' || !scanner.Take(':') || members.size() == most) return false;
    members.push_back({name, scanner.Value()});
    return !members.back().value.empty();
  });
  return whole ? std::optional(std::move(members)) : std::nullopt;
}

std::optional<std::vector<std::string_view>> JsonElements(std::string_view array, size_t most) {
  std::vector<std::string_view> elements;
  const bool whole = TakeAll(array, "[]", [&elements, most](Scanner& scanner) {
    if (elements.size() == most) return false;
    elements.push_back(scanner.Value());
    return !elements.back().empty();
  });
  return whole ? std::optional(std::move(elements)) : std::nullopt;
}

}  // namespace ferrox
