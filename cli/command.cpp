#include "cli/command.h"

#include <algorithm>
#include <cerrno>
#include <cstdint>
#include <cstdlib>

#include "cli/did_you_mean.h"
#include "cli/word_meaning.h"

namespace ferrox::cli {

namespace {

const Option kHelpOption = {"--help", nullptr, "this text"};

/// Null for an option that the command does not have. Every command has "--help".
const Option* FindOption(const Command& command, const std::string& name) {
  for (const Option& option : command.options) {
    if (name == option.name) return &option;
  }
  return name == kHelpOption.name ? &kHelpOption : nullptr;
}

/// "[=N]": the value may be left out, and so only "=" can give it; the next word is never taken for it.
bool IsOptional(const char* value) { return value[0] == '['; }

/// Where the table lists the values ("name|date"), only these are taken. Other values the command checks itself.
void CheckChoice(const Option& option, const std::string& given) {
  const std::string value = option.value;
  if (value.find('|') == std::string::npos) return;
  const std::vector<std::string> choices = Split(value, '|');
  if (std::find(choices.begin(), choices.end(), given) != choices.end()) return;
  throw UsageError(std::string(option.name) + " takes one of: " + value + ", not \"" + given + "\"" +
                   DidYouMean(given, choices));
}

[[noreturn]] void ThrowUnknownOption(const Command& command, const std::string& name) {
  std::vector<std::string> known = {kHelpOption.name};
  for (const Option& option : command.options) known.emplace_back(option.name);
  const std::string meant = DidYouMean(name, known);
  const bool is_short = name[1] != '-';
  throw UsageError("unknown option " + name + meant +
                   (is_short && meant.empty() ? "; a name that begins with - stands behind --" : ""));
}

/// Takes the option at `at` and leaves `at` at its last word.
void TakeOption(const Command& command, const std::vector<std::string>& given, size_t& at, Arguments& arguments) {
  const size_t equals = given[at].find('=');
  const std::string name = given[at].substr(0, equals);
  const Option* option = FindOption(command, name);
  if (option == nullptr) ThrowUnknownOption(command, name);
  if (option->value == nullptr) {
    if (equals != std::string::npos) throw UsageError(name + " takes no value");
    arguments.options[name] = "";
  } else if (equals != std::string::npos || IsOptional(option->value)) {
    arguments.options[name] = equals == std::string::npos ? "" : given[at].substr(equals + 1);
  } else {
    if (at + 1 == given.size()) throw UsageError(name + " needs a value: " + name + " " + option->value);
    arguments.options[name] = given[++at];
  }
  if (option->value != nullptr) CheckChoice(*option, arguments.options[name]);
  arguments.given.emplace_back(name, arguments.options[name]);
}

/// How many words a command takes, read from its usage: "[...]" may be left out, "..." may be repeated.
struct WordLimits {
  explicit WordLimits(const Command& command) {
    for (const std::string& word : Split(command.words, ' ')) {
      if (word.empty()) continue;
      if (word[0] != '[') ++least;
      most = word.find("...") != std::string::npos ? SIZE_MAX : most + 1;
    }
  }
  size_t least = 0;
  size_t most = 0;
};

/// The first word that is missing is named, with what it stands for. @throws UsageError.
void CheckWords(const Command& command, const std::vector<std::string>& words) {
  const WordLimits limits(command);
  if (words.size() > limits.most) {
    const char* hint = limits.most == 0 ? "" : "; a name with blanks in it stands in quotes";
    throw UsageError("\"" + words[limits.most] + "\" is one word too many" + hint);
  }
  if (words.size() >= limits.least) return;
  const std::string word = PlainWord(Split(command.words, ' ')[words.size()]);
  const std::string meaning = MeaningOf(command, word);
  throw UsageError(word + " is missing" + (meaning.empty() ? "" : ": " + meaning) + "\nExample: " + ExampleOf(command));
}

/// As a usage line shows it: "--limit N", "--fresh[=SECONDS]".
std::string OptionText(const Option& option) {
  if (option.value == nullptr) return option.name;
  return std::string(option.name) + (IsOptional(option.value) ? "" : " ") + option.value;
}

}  // namespace

std::vector<std::string> Split(const std::string& text, char separator) {
  std::vector<std::string> parts;
  size_t begin = 0;
  for (size_t end = 0; end != std::string::npos; begin = end + 1) {
    end = text.find(separator, begin);
    parts.push_back(text.substr(begin, end - begin));
  }
  return parts;
}

std::string Arguments::Get(const std::string& name, const std::string& otherwise) const {
  const auto found = options.find(name);
  return found == options.end() ? otherwise : found->second;
}

std::vector<std::string> Arguments::All(const std::string& name) const {
  std::vector<std::string> values;
  for (const auto& [option, value] : given) {
    if (option == name) values.push_back(value);
  }
  return values;
}

long long Arguments::Number(const std::string& name, long long otherwise, long long least, long long most) const {
  if (!Has(name)) return otherwise;
  const std::string text = Get(name);
  char* end = nullptr;
  errno = 0;
  // strtoll stops at the first byte that is no digit; only a text that is a number as a whole counts.
  const long long number = strtoll(text.c_str(), &end, 10);
  if (text.empty() || *end != '\0' || errno != 0 || number < least || number > most) {
    throw UsageError(name + " takes a number from " + std::to_string(least) + " to " + std::to_string(most) +
                     (text.empty() ? "" : ", not \"" + text + "\""));
  }
  return number;
}

/// Options may stand anywhere among the words, and an option that is given twice has its last value. With "--help" the
/// number of words does not matter.
Arguments ParseArguments(const Command& command, const std::vector<std::string>& given) {
  Arguments arguments;
  const bool takes_query = std::string(command.words).find("QUERY") != std::string::npos;  // which may begin with "-"
  bool options_ended = false;
  for (size_t at = 0; at < given.size(); ++at) {
    const bool is_short_option = !takes_query && given[at].size() > 1 && given[at][0] == '-' && given[at][1] != '-';
    if (is_short_option && !options_ended) ThrowUnknownOption(command, given[at]);
    if (options_ended || given[at].compare(0, 2, "--") != 0) {
      arguments.words.push_back(given[at]);
    } else if (given[at] == "--") {
      options_ended = true;
    } else {
      TakeOption(command, given, at, arguments);
    }
  }
  if (arguments.Has(kHelpOption.name)) return arguments;
  CheckWords(command, arguments.words);
  const bool is_replaced = std::any_of(command.options.begin(), command.options.end(), [&](const Option& option) {
    return option.replaces_needed && arguments.Has(option.name);
  });
  for (const Option& option : command.options) {
    if (!option.is_needed || is_replaced || arguments.Has(option.name)) continue;
    throw UsageError(std::string(option.name) + " is missing: " + option.help + "\nExample: " + ExampleOf(command));
  }
  return arguments;
}

std::string UsageLine(const Command& command) {
  std::string line = std::string("fileindexctl ") + command.name;
  for (const Option& option : command.options) {
    line += " " + (option.is_needed ? OptionText(option) : "[" + OptionText(option) + "]");
  }
  return *command.words == '\0' ? line : line + " " + command.words;
}

std::string HelpFor(const Command& command) {
  std::vector<std::pair<std::string, std::string>> rows;
  for (const std::string& word : Split(command.words, ' ')) {
    const std::string meaning = MeaningOf(command, PlainWord(word));
    if (!meaning.empty()) rows.emplace_back(PlainWord(word), meaning);
  }
  for (const Option& option : command.options) rows.emplace_back(OptionText(option), option.help);
  rows.emplace_back(kHelpOption.name, kHelpOption.help);
  size_t width = 0;
  for (const auto& [left, right] : rows) width = std::max(width, left.size());
  std::string text = "Usage: " + UsageLine(command) + "\n" + command.help + "\n";
  for (const auto& [left, right] : rows) text += "  " + left + std::string(width - left.size() + 3, ' ') + right + "\n";
  return text + "Example: " + ExampleOf(command) + "\n";
}

}  // namespace ferrox::cli
