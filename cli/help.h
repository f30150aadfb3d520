#pragma once

#include <string>
#include <vector>

#include "cli/command.h"

namespace ferrox::cli {

/// The whole help: all commands by their groups, a line each.
std::string Overview();

/// What stands behind "help": the help of a command, the commands that begin with a word ("folder"), or the whole.
/// @throws UsageError for a command that does not exist.
std::string HelpOn(const std::vector<std::string>& words);

/// For words that no command's name begins with: says which commands there are, or which one was probably meant.
[[noreturn]] void ThrowNoCommand(const std::vector<std::string>& words);

/// For an option before the command.
[[noreturn]] void ThrowNoGlobalOption(const std::string& option);

/// What is wrong with a command's words, with its usage line and where its help is.
std::string WithUsage(const Command& command, const std::string& problem);

}  // namespace ferrox::cli
