#pragma once

#include <map>
#include <stdexcept>
#include <string>
#include <utility>
#include <vector>

namespace ferrox::cli {

/// How a command ends, for scripts; the manual lists them. kIncomplete: what was shown is right, but something that was
/// asked for was left out, or may not be up to date. kNothingFound is no failure: the search worked.
enum ExitCode { kDone = 0, kNothingFound = 1, kWrongUsage = 2, kFailure = 3, kIncomplete = 4, kNotPermitted = 5 };

/// The command line cannot be understood: exit code 2. The sentence says what is wrong with it; main() adds the usage
/// line of the command.
class UsageError : public std::runtime_error {
 public:
  using std::runtime_error::runtime_error;
};

/// Something went wrong; the sentence names the thing and the remedy: exit code 3. An Error of the library that reaches
/// main() ends the tool alike, in the words of Explain.
class Failure : public std::runtime_error {
 public:
  using std::runtime_error::runtime_error;
};

/// The same, where a daemon refused what it was asked: its error code, and its sentence without the daemon's name, for
/// commands that go on with other shares or know a better remedy.
class Refusal : public Failure {
 public:
  Refusal(const std::string& daemon, int code, const std::string& reason)
      : Failure(daemon + ": " + reason), code_(code), reason_(reason) {}
  int Code() const { return code_; }
  const std::string& Reason() const { return reason_; }

 private:
  int code_;
  std::string reason_;
};

/// The calling user may not do it; the sentence says what, and what to do: exit code 5. No Failure: a command that goes
/// on after the failure of one share does not go on after this, since the next share would fail in the same way.
class NotPermitted : public std::runtime_error {
 public:
  using std::runtime_error::runtime_error;
};

/// What a command needs of the instance, which main() sees to before it runs the command: rights are asked for, folders
/// are made. Each includes what stands before it, but for the table of shares, which kService and kInstance can do
/// without: the daemons can be steered and paused while the table is being mended.
enum class Needs {
  kNothing,
  kReading,   ///< to read its settings
  kAnswers,   ///< a table of shares that can be used
  kService,   ///< to steer the daemons, which only the instance's owner and root may
  kInstance,  ///< its folders, which are made when they are missing
  kShares,    ///< and the table of shares
};

/// An option of a command, such as "--limit N".
struct Option {
  const char* name;  ///< "--limit"
  /// "N", or what can be given, "name|date"; null: the option takes none; "[=N]": it can be left out, and only "="
  /// gives it.
  const char* value;
  const char* help;
  bool is_needed = false;        ///< the command cannot do without it
  bool replaces_needed = false;  ///< with it, the command can
};

/// What was given to a command, sorted by ParseArguments.
struct Arguments {
  std::vector<std::string> words;                          ///< in their order, the command's own name not among them
  std::map<std::string, std::string> options;              ///< by name, "--limit"; "" for one that takes no value
  std::vector<std::pair<std::string, std::string>> given;  ///< all options as they came, for those that may be repeated

  bool Has(const std::string& name) const { return options.count(name) != 0; }
  std::string Get(const std::string& name, const std::string& otherwise = "") const;
  /// The values of an option that may be repeated, in their order.
  std::vector<std::string> All(const std::string& name) const;
  /// A number from `least` to `most`. @throws UsageError.
  long long Number(const std::string& name, long long otherwise, long long least, long long most) const;
};

/// One row of the table of commands (command_table.h). Parsing, help, usage lines and completion all go by it.
struct Command {
  const char* name;   ///< one or two words
  const char* words;  ///< as in the usage line: "SHARE [FOLDER]", "PATH..."; the names choose what is completed
  std::vector<Option> options;
  const char* help;
  int (*run)(const Arguments& arguments);  ///< @return an ExitCode; throws what main() turns into one
  Needs needs = Needs::kReading;
  /// What the command does for an ordinary user (caller.h); null: it is not for them.
  int (*run_for_user)(const Arguments& arguments) = nullptr;
};

/// Sorts a command's words and options, and checks how many words there are, the options of which the table lists the
/// values, and those that are needed. "--" ends the options. @throws UsageError.
Arguments ParseArguments(const Command& command, const std::vector<std::string>& given);
/// The command's own help text.
std::string HelpFor(const Command& command);
std::string UsageLine(const Command& command);
/// The parts of a text between single separators: what an option takes ("name|date"), a command's words.
std::vector<std::string> Split(const std::string& text, char separator);

}  // namespace ferrox::cli
