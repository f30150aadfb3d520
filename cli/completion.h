#pragma once

#include <string>
#include <vector>

namespace ferrox::cli {

/// A command for the shells' completion scripts only (packaging/completions); it stands in no help. Its arguments are
/// the words of the command line up to the cursor.
inline constexpr char kCompleteCommand[] = "complete-words";

/// What the last of `words`, which need not be whole, can become: command names, options, the values that the table
/// lists, shares, folders; sorted, each once. A text that begins with ":" is for
/// the shell: ":files", ":folders" or ":users" asks it for its own names, ":open" to put no blank behind the word.
std::vector<std::string> Completions(std::vector<std::string> words);
/// Prints them, one a line. @return kDone. What is thrown main() reports on standard error, which the scripts drop.
int PrintCompletions(const std::vector<std::string>& words);

}  // namespace ferrox::cli
