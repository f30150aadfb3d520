#pragma once

#include <map>
#include <stdexcept>
#include <string>
#include <vector>

namespace ferrox::cli {

/// kIncomplete: something that was asked for was left out, or may not be up to date.
enum ExitCode { kDone = 0, kNothingFound = 1, kWrongUsage = 2, kFailure = 3, kIncomplete = 4, kNotPermitted = 5 };

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

/// The same, where a daemon refused: its error code, and its sentence alone.
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

/// The calling user may not do it; the sentence says what, and what to do: exit code 5. No Failure: who goes on after
/// one does not go on after this.
class NotPermitted : public std::runtime_error {
 public:
  using std::runtime_error::runtime_error;
};

/// What a command needs of the instance; each also what stands before it, but for the table of shares.
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
  const char* words;  ///< as in the usage line: "SHARE [FOLDER]", "PATH..."; the names choose what is completed
  std::vector<Option> options;
  const char* help;
  int (*run)(const Arguments& arguments);
  Needs needs = Needs::kReading;
};

/// Sorts a command's words and options, and checks how many words there are and the options of which the table lists
/// the values. "--" ends the options. @throws UsageError.
Arguments ParseArguments(const Command& command, const std::vector<std::string>& given);
/// The command's own help text.
std::string HelpFor(const Command& command);
std::string UsageLine(const Command& command);
/// The parts of a text between single separators: what an option takes ("name|date"), a command's words.
std::vector<std::string> Split(const std::string& text, char separator);

}  // namespace ferrox::cli
