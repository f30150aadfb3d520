#pragma once

#include <string>
#include <vector>

namespace ferrox::cli {

/// A command for the shells' completion scripts only; it stands in no help.
inline constexpr char kCompleteCommand[] = "complete-words";

/// What the last of `words`, which need not be whole, can become: one text a line. A line that begins with ":" is for
/// the shell: ":files" or ":folders" asks it for its own names, ":open" to put no blank behind the word.
std::vector<std::string> Completions(std::vector<std::string> words);
int PrintCompletions(const std::vector<std::string>& words);

}  // namespace ferrox::cli
