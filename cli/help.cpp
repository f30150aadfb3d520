#include "cli/help.h"

#include <algorithm>

#include "cli/caller.h"
#include "cli/command_table.h"
#include "cli/did_you_mean.h"
#include "cli/escape.h"

namespace ferrox::cli {

namespace {

constexpr char kTryHelp[] = "\nTry 'fileindexctl help'.";

/// A line for a command: the first sentence of what it does, beside its name and words.
std::string LineOf(const Command& command) {
  constexpr size_t kWidth = 32;
  const std::string left = std::string(command.name) + " " + command.words;
  const std::string help = command.help;
  return "  " + left + std::string(left.size() < kWidth ? kWidth - left.size() : 1, ' ') +
         help.substr(0, help.find(". ")) + (help.find(". ") == std::string::npos ? "\n" : ".\n");
}

/// The commands that the caller may use: those whose name is `first` and another word, or all.
std::vector<const Command*> CommandsFor(const std::string& first) {
  std::vector<const Command*> found;
  for (const CommandGroup& group : CommandTable()) {
    for (const Command& command : group.commands) {
      const std::vector<std::string> name = Split(command.name, ' ');
      if (MayUse(command) && (first.empty() || (name.size() > 1 && name[0] == first))) found.push_back(&command);
    }
  }
  return found;
}

/// Names of commands; `last_words`: of each only the last word.
std::vector<std::string> Names(const std::vector<const Command*>& commands, bool last_words) {
  std::vector<std::string> names;
  names.reserve(commands.size());
  for (const Command* command : commands) {
    names.push_back(last_words ? Split(command->name, ' ').back() : command->name);
  }
  return names;
}

std::string Joined(const std::vector<std::string>& words) {
  std::string list;
  for (const std::string& word : words) list += (list.empty() ? "" : ", ") + word;
  return list;
}

/// What other tools call the same.
std::string OtherNameOf(const std::string& word) {
  constexpr struct {
    const char* word;
    const char* command;
  } kOtherNames[] = {{"find", "search"}, {"query", "search"}, {"grep", "search"},      {"start", "up"},
                     {"stop", "down"},   {"scan", "index"},   {"update", "index"},     {"ls", "folder list"},
                     {"info", "show"},   {"cat", "show"},     {"rm", "folder delete"}, {"errors", "unread"}};
  for (const auto& other : kOtherNames) {
    if (word == other.word) return other.command;
  }
  return "";
}

/// The end of a sentence about a command that does not exist. The first two words may be one name.
std::string CommandMeant(const std::vector<std::string>& words) {
  const std::string other = OtherNameOf(words[0]);
  if (!other.empty()) return ". Did you mean: " + other + "?";
  std::vector<std::string> known = Names(CommandsFor(""), false);
  for (const std::string& name : std::vector<std::string>(known)) known.push_back(Split(name, ' ')[0]);
  known.push_back("help");
  const std::string meant = words.size() > 1 ? DidYouMean(words[0] + " " + words[1], known) : "";
  return meant.empty() ? DidYouMean(words[0], known) : meant;
}

}  // namespace

std::string Overview() {
  std::string text =
      "Usage: fileindexctl [--root DIR] COMMAND ...\n"
      "Finds files by their names and contents, and looks after the index that this needs.\n\n";
  for (const CommandGroup& group : CommandTable()) {
    text += std::string(group.title) + ":\n";
    for (const Command& command : group.commands) text += LineOf(command);
    text += "\n";
  }
  return text +
         "  help COMMAND  what a command does, its options and an example; the same as COMMAND --help\n"
         "  --root DIR    the instance's folder (default: the environment variable FERROX_ROOT, else the host's own)\n"
         "  --version     the version\n"
         "Exit codes: 0 done, 1 nothing found, 2 wrong usage, 3 failure, 4 something was left out,\n"
         "5 not permitted to this user.\n";
}

std::string HelpOn(const std::vector<std::string>& words) {
  if (words.empty()) return Overview();
  size_t name_words = 0;
  const Command* command = FindCommand(words, name_words);
  if (command != nullptr) return HelpFor(*command);
  const std::vector<const Command*> commands = words.size() == 1 ? CommandsFor(words[0]) : CommandsFor("no command");
  if (commands.empty()) ThrowNoCommand(words);
  std::string text = "Usage: fileindexctl " + words[0] + " COMMAND ...\n";
  for (const Command* one : commands) text += LineOf(*one);
  return text + "'fileindexctl help " + words[0] + " COMMAND' says more.\n";
}

void ThrowNoCommand(const std::vector<std::string>& words) {
  const std::vector<const Command*> second = CommandsFor(words[0]);
  if (second.empty()) {
    throw UsageError("there is no command \"" + EscapeForTerminal(words[0]) + "\"" + CommandMeant(words) + kTryHelp);
  }
  const std::vector<std::string> known = Names(second, true);
  const std::string list = words[0] + " is followed by one of: " + Joined(known);
  if (words.size() < 2) throw UsageError("a word is missing: " + list + kTryHelp);
  const std::string name = words[0] + " " + words[1];
  throw UsageError("there is no command \"" + EscapeForTerminal(name) + "\"" + DidYouMean(name, Names(second, false)) +
                   "\n" + list + kTryHelp);
}

void ThrowNoGlobalOption(const std::string& option) {
  const std::string name = option.substr(0, option.find('='));
  for (const Command* command : CommandsFor("")) {
    const auto& options = command->options;
    if (std::none_of(options.begin(), options.end(), [&](const Option& one) { return name == one.name; })) continue;
    throw UsageError(name + " stands behind its command, as in: fileindexctl " + command->name + " " + name + kTryHelp);
  }
  throw UsageError("unknown option " + EscapeForTerminal(name) + DidYouMean(name, {"--root", "--help", "--version"}) +
                   kTryHelp);
}

std::string WithUsage(const Command& command, const std::string& problem) {
  return problem + "\nUsage: " + UsageLine(command) + "\nTry 'fileindexctl help " + command.name + "'.";
}

}  // namespace ferrox::cli
