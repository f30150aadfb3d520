#pragma once

#include <map>
#include <stdexcept>
#include <string>
#include <vector>

namespace ferrox::cli {

enum ExitCode { kDone = 0, kNothingFound = 1, kWrongUsage = 2, kFailure = 3 };

/// The command line cannot be understood: exit code 2.
class UsageError : public std::runtime_error {
 public:
  using std::runtime_error::runtime_error;
};

/// Something went wrong; the sentence names the thing and the remedy: exit code 3.
class Failure : public std::runtime_error {
 public:
  using std::runtime_error::runtime_error;
};

/// An option of a command, such as "--limit N".
struct Option {
  const char* name;   ///< "--limit"
  const char* value;  ///< "N"; null: the option takes none
  const char* help;
};

/// What was given to a command.
struct Arguments {
  std::vector<std::string> words;
  std::map<std::string, std::string> options;

  bool Has(const std::string& name) const { return options.count(name) != 0; }
  std::string Get(const std::string& name, const std::string& otherwise = "") const;
  /// A number from `least` to `most`. @throws UsageError.
  long long Number(const std::string& name, long long otherwise, long long least, long long most) const;
};

/// One row of the table of commands.
struct Command {
  const char* name;   ///< one or two words
  const char* words;  ///< for the usage line, for example "SHARE"
  size_t words_min;
  size_t words_max;
  std::vector<Option> options;
  const char* help;
  int (*run)(const Arguments& arguments);
  bool changes = false;  ///< what it does needs the instance's folders
};

/// Sorts a command's words and options. "--" ends the options. @throws UsageError.
Arguments ParseArguments(const Command& command, const std::vector<std::string>& given);
/// The command's own help text.
std::string HelpFor(const Command& command);
std::string UsageLine(const Command& command);

int RunUp(const Arguments& arguments);
int RunDown(const Arguments& arguments);
int RunStatus(const Arguments& arguments);
int RunPause(const Arguments& arguments);
int RunResume(const Arguments& arguments);
int RunShareAdd(const Arguments& arguments);
int RunShareList(const Arguments& arguments);
int RunShareRemove(const Arguments& arguments);
int RunIndex(const Arguments& arguments);
int RunSearch(const Arguments& arguments);
int RunQueueShow(const Arguments& arguments);

}  // namespace ferrox::cli
