#include "services/kovaelasticd/query/query_words.h"

#include <algorithm>
#include <iterator>

#include "base/text.h"
#include "services/kovaelasticd/query/field_names.h"
#include "services/kovaelasticd/text/pattern.h"

namespace ferrox::engine {

namespace {

bool IsAsciiAlnum(char c) {
  const char lower = base::LowerAscii(c);
  return (lower >= 'a' && lower <= 'z') || (c >= '0' && c <= '9');
}

bool IsPlain(std::string_view word) { return !word.empty() && std::all_of(word.begin(), word.end(), &IsAsciiAlnum); }

std::vector<std::string> Split(std::string_view text, char separator) {
  std::vector<std::string> parts;
  for (size_t begin = 0; begin <= text.size();) {
    const size_t end = std::min(text.size(), text.find(separator, begin));
    parts.emplace_back(text.substr(begin, end - begin));
    begin = end + 1;
  }
  return parts;
}

/// Where `words` stand in the text as whole words; npos for nowhere.
size_t FindWords(const std::string& text, std::string_view words) {
  for (size_t at = text.find(words); at != text.npos; at = text.find(words, at + 1)) {
    const size_t end = at + words.size();
    if ((at == 0 || text[at - 1] == ' ') && (end == text.size() || text[end] == ' ')) return at;
  }
  return text.npos;
}

constexpr std::string_view kComparisons[] = {"bigger than", "larger than", "greater than", "smaller than"};
constexpr std::string_view kAges[] = {"newer than", "older than"};
constexpr std::string_view kTimes[] = {"today",      "yesterday",  "last week", "this week",
                                       "last month", "this month", "last year", "this year"};
/// A sentence of more words is hardly meant as conditions.
constexpr ptrdiff_t kShortQueryWords = 6;

bool LooksLikeRegularExpression(const std::string& text) {
  const bool has_class = text.find("\\d") != text.npos || text.find("\\w") != text.npos ||
                         text.find("[a-z") != text.npos || text.find("[0-9") != text.npos;
  return has_class || text.find(".*") != text.npos || text.find(".+") != text.npos ||
         (text.size() > 2 && text.front() == '^');
}

/// Whether mail that is pasted has a line which begins so.
bool IsHeadOfMail(std::string_view name) {
  return name == "Date" || name == "From" || name == "To" || name == "Subject" || name == "Sender";
}

}  // namespace

std::vector<std::string> ExtensionsAsked(std::string_view word) {
  if (!word.starts_with("*.")) return {};
  word.remove_prefix(2);
  const bool several = word.size() > 2 && word.front() == '{' && word.back() == '}';
  std::vector<std::string> extensions =
      several ? Split(word.substr(1, word.size() - 2), ',') : std::vector<std::string>{std::string(word)};
  for (std::string& extension : extensions) {
    if (!IsPlain(extension)) return {};
    extension = base::LowerAscii(std::move(extension));
  }
  return extensions;
}

std::vector<std::string> Alternatives(std::string_view word) {
  std::vector<std::string> words = Split(word, '|');
  const bool all_plain = std::all_of(words.begin(), words.end(), [](const std::string& one) { return IsPlain(one); });
  return all_plain ? words : std::vector<std::string>{std::string(word)};
}

std::string PatternAsked(std::string_view word) {
  std::string pattern(word.substr(0, word.find_last_not_of(".,;!)") + 1));
  for (size_t at = pattern.find(".*"); at != pattern.npos; at = pattern.find(".*", at + 1)) {
    if (at > 0 && at + 2 < pattern.size() && IsAsciiAlnum(pattern[at + 2])) pattern.erase(at, 1);
  }
  return IsPattern(pattern) ? pattern : std::string();
}

std::string_view BeforeWildcard(std::string_view word) {
  word = word.substr(0, word.find_last_not_of("*?") + 1);  // those of "what??" are punctuation
  const size_t at = word.find_first_of("*?");
  if (at == std::string_view::npos || (word.front() >= '0' && word.front() <= '9')) return {};
  const bool plain = std::all_of(word.begin(), word.end(),
                                 [](char c) { return IsAsciiAlnum(c) || c == '*' || c == '?' || (c & 0x80) != 0; });
  return plain ? word.substr(0, at) : std::string_view();
}

size_t SchemeBytes(std::string_view word) {
  const std::string lower = base::LowerAscii(std::string(word.substr(0, 8)));
  for (const std::string_view scheme : {"https://", "http://", "ftp://", "mailto:"}) {
    if (lower.starts_with(scheme) && word.size() > scheme.size()) return scheme.size();
  }
  return 0;
}

std::string HintAtColon(const std::string& word, bool is_last) {
  const size_t colon = word.find(':');
  if (colon == std::string::npos) return {};
  const std::string name = word.substr(0, colon);
  if (colon + 1 < word.size()) {
    const std::string meant = FieldMeantBy(name);
    if (meant.empty()) return {};
    return "\"" + name + ":\" is no field, so it is looked for as text; there is " + meant + ":";
  }
  if (!IsFieldName(name)) return {};
  const std::string as_text = "\"" + word + "\" is looked for as text; ";
  if (is_last) return as_text + "a field needs a value behind it";
  const bool is_capital = name.front() >= 'A' && name.front() <= 'Z';
  if (!is_capital || IsHeadOfMail(name)) return {};
  return as_text + "to look there alone, write it small, as in " + base::LowerAscii(name) + ":x";
}

std::vector<std::string> HintsAtText(const std::string& words) {
  const std::string text = base::LowerAscii(words);
  std::vector<std::string> hints;
  const auto has = [&text](const auto& phrases) {
    const auto* const found = std::find_if(std::begin(phrases), std::end(phrases), [&text](std::string_view phrase) {
      return FindWords(text, phrase) != text.npos;
    });
    return found == std::end(phrases) ? std::string() : std::string(*found);
  };
  if (const std::string said = has(kComparisons); !said.empty()) {
    hints.push_back("\"" + said + "\" is looked for as text; the size of a file is asked for by size:>10M");
  }
  if (const std::string said = has(kAges); !said.empty()) {
    hints.push_back("\"" + said + "\" is looked for as text; when a file was changed is asked for by date:<2024");
  }
  const bool is_short = std::count(text.begin(), text.end(), ' ') < kShortQueryWords;
  if (const std::string said = has(kTimes); is_short && !said.empty()) {
    hints.push_back("\"" + said + "\" is looked for as text; for files that were changed then, write date:\"" + said +
                    "\"");
  }
  const size_t without = FindWords(words, "not");
  if (is_short && without != text.npos && without > 0 && without + 3 < text.size()) {
    hints.push_back("\"not\" is looked for as a word; to leave something out, write NOT or a \"-\" before it");
  }
  if (LooksLikeRegularExpression(words)) {
    hints.push_back(
        "a pattern is written with \"*\" for any letters and \"?\" for one, as in rep*t; other signs mean "
        "nothing");
  }
  return hints;
}

}  // namespace ferrox::engine
