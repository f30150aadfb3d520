#include <cerrno>
#include <clocale>
#include <cstdio>

#include "base/files.h"
#include "cli/caller.h"
#include "cli/command_table.h"
#include "cli/completion.h"
#include "cli/escape.h"
#include "cli/explain.h"
#include "cli/global_options.h"
#include "cli/output.h"
#include "cli/rights.h"
#include "common/error.h"
#include "common/paths.h"
#include "services/support/daemon.h"
#include "services/support/instance_owner.h"

#ifndef FERROX_VERSION
#define FERROX_VERSION "unknown"
#endif

namespace {

using namespace ferrox::cli;  // NOLINT: the tool's own

/// The whole help: all commands by their groups, a line each.
std::string Overview() {
  std::string text =
      "Usage: fileindexctl [--root DIR] COMMAND ...\n"
      "Searches the contents of folders, and looks after what that needs.\n\n";
  constexpr size_t kWidth = 32;
  for (const CommandGroup& group : CommandTable()) {
    text += std::string(group.title) + ":\n";
    for (const Command& command : group.commands) {
      const std::string left = std::string(command.name) + " " + command.words;
      text += "  " + left + std::string(left.size() < kWidth ? kWidth - left.size() : 1, ' ') + command.help + "\n";
    }
    text += "\n";
  }
  return text +
         "  --root DIR   the instance's folder (default: the environment variable FERROX_ROOT, else the host's own)\n"
         "  --version    the version\n"
         "  --help       this text, or after a command that command's help\n"
         "Exit codes: 0 done, 1 nothing found, 2 wrong usage, 3 failure, 4 something was left out,\n"
         "5 not permitted to this user.\n";
}

/// Takes the options that stand before the command. True when one of them has done all there was to do.
bool TakeGlobalOptions(std::vector<std::string>& words) {
  TakeRoot(words);
  if (words.empty() || words[0].compare(0, 2, "--") != 0) return false;
  if (words[0] != "--help" && words[0] != "--version") throw UsageError("unknown option " + words[0]);
  (void)fputs(words[0] == "--help" ? Overview().c_str() : "fileindexctl " FERROX_VERSION "\n", stdout);
  return true;
}

/// An instance of its own begins as an empty folder; the host's own has its folders from its package.
void PrepareInstance(Needs needs) {
  const std::string problem = ferrox::InstanceRootProblem();
  if (!problem.empty()) throw Failure(problem);
  RequireRights(needs);
  if (needs != Needs::kNothing && needs != Needs::kService) RequireShareTable(needs);
  if (needs < Needs::kInstance || ferrox::InstancePath("").empty()) return;
  ferrox::services::ClosePrivateFolders();
  for (const char* folder : {"/tmp", "/var/run", ferrox::kConfigurationFolder}) {
    const std::string path = ferrox::InstancePath(folder);
    if (!base::MakeFolders(path)) ThrowSystemFailure(errno, "make", path);
  }
  // A lock file that other users could hold would let them stop every change of this instance.
  ferrox::services::GuardLockFiles();
}

/// A word that begins names of two words is answered with what can follow it.
[[noreturn]] void ThrowNoCommand(const std::string& word) {
  std::string known;
  for (const std::string& second : Completions({word, ""})) known += (known.empty() ? "" : ", ") + second;
  if (!known.empty()) throw UsageError(word + " is followed by one of: " + known);
  throw UsageError("there is no command \"" + EscapeForTerminal(word) + "\"");
}

/// Finds the command, parses its arguments, prepares the instance and runs it. Help needs no instance.
int Run(std::vector<std::string> words) {
  if (!words.empty() && words[0] == kCompleteCommand) return PrintCompletions({words.begin() + 1, words.end()});
  if (TakeGlobalOptions(words)) return kDone;
  if (words.empty()) throw UsageError("say what to do");
  size_t name_words = 0;
  const Command* command = FindCommand(words, name_words);
  if (command == nullptr) ThrowNoCommand(words[0]);
  words.erase(words.begin(), words.begin() + static_cast<std::ptrdiff_t>(name_words));
  try {
    const Arguments arguments = ParseArguments(*command, words);
    if (arguments.Has("--help")) {
      (void)fputs(HelpFor(*command).c_str(), stdout);
      return kDone;
    }
    if (!IsPrivileged()) return RunForUser(*command, arguments);
    PrepareInstance(command->needs);
    return command->run(arguments);
  } catch (const UsageError& error) {
    throw UsageError(std::string(error.what()) + "\nUsage: " + UsageLine(*command));
  }
}

}  // namespace

/// Each kind of failure has its exit code (ExitCode). Everything else that is thrown, such as a lack of memory, is a
/// failure, too.
int main(int argc, char** argv) {
  (void)setlocale(LC_CTYPE, "");
  try {
    const int code = Run({argv + 1, argv + argc});
    FlushOutput();
    return code;
  } catch (const UsageError& error) {
    (void)fprintf(stderr, "fileindexctl: %s\nTry 'fileindexctl --help'.\n", EscapeText(error.what()).c_str());
    return kWrongUsage;
  } catch (const NotPermitted& error) {
    Warn(error.what());
    return kNotPermitted;
  } catch (const ferrox::Error& error) {
    Warn(Explain(error));
    if (error.Code() == ferrox::Error::kCredentialsFailed) return kNotPermitted;
  } catch (const std::exception& error) {
    Warn(error.what());
  }
  return kFailure;
}
