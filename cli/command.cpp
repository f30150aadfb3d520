#include "cli/command.h"

#include <algorithm>
#include <cerrno>
#include <cstdint>
#include <cstdlib>

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
  throw UsageError(std::string(option.name) + " takes one of: " + value);
}

/// Takes the option at `at` and leaves `at` at its last word.
void TakeOption(const Command& command, const std::vector<std::string>& given, size_t& at, Arguments& arguments) {
  const size_t equals = given[at].find('=');
  const std::string name = given[at].substr(0, equals);
  const Option* option = FindOption(command, name);
  if (option == nullptr) throw UsageError("unknown option " + name);
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
    throw UsageError(name + " takes a number from " + std::to_string(least) + " to " + std::to_string(most));
  }
  return number;
}

/// Options may stand anywhere among the words, and an option that is given twice has its last value. With "--help" the
/// number of words does not matter.
Arguments ParseArguments(const Command& command, const std::vector<std::string>& given) {
  Arguments arguments;
  bool options_ended = false;
  for (size_t at = 0; at < given.size(); ++at) {
    if (options_ended || given[at].compare(0, 2, "--") != 0) {
      arguments.words.push_back(given[at]);
    } else if (given[at] == "--") {
      options_ended = true;
    } else {
      TakeOption(command, given, at, arguments);
    }
  }
  if (arguments.Has(kHelpOption.name)) return arguments;
  const WordLimits limits(command);
  if (arguments.words.size() < limits.least) throw UsageError("something is missing");
  if (arguments.words.size() > limits.most) {
    throw UsageError("\"" + arguments.words[limits.most] + "\" is one word too many");
  }
  return arguments;
}

std::string UsageLine(const Command& command) {
  std::string line = std::string("fileindexctl ") + command.name;
  for (const Option& option : command.options) line += " [" + OptionText(option) + "]";
  return *command.words == '\0' ? line : line + " " + command.words;
}

std::string HelpFor(const Command& command) {
  std::string text = "Usage: " + UsageLine(command) + "\n" + command.help + "\n";
  std::vector<Option> options = command.options;
  options.push_back(kHelpOption);
  size_t width = 0;
  for (const Option& option : options) width = std::max(width, OptionText(option).size());
  for (const Option& option : options) {
    const std::string left = OptionText(option);
    text += "  " + left + std::string(width - left.size() + 3, ' ') + option.help + "\n";
  }
  return text;
}

}  // namespace ferrox::cli
