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
#include "cli/help.h"
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

/// "help search --help" asks once.
std::vector<std::string> WithoutHelp(std::vector<std::string> words) {
  if (!words.empty() && (words.back() == "--help" || words.back() == "-h")) words.pop_back();
  return words;
}

/// Whether help is asked for behind a command, or behind the first word of several commands. "-h" is a word of a query.
bool AsksForHelp(const std::vector<std::string>& words) {
  const std::string& last = words.back();
  if (words.size() < 2 || words.size() > 3) return false;
  return last == "--help" || (last == "-h" && (words.size() == 2 || words[0] != "search"));
}

/// Takes the options that stand before the command, and "help". True when one of them has done all there was to do.
bool TakeGlobalOptions(std::vector<std::string>& words) {
  TakeRoot(words);
  if (words.empty()) return false;
  const std::string& first = words[0];
  if (first == "help" || first == "--help" || first == "-h") {
    (void)fputs(HelpOn(WithoutHelp({words.begin() + 1, words.end()})).c_str(), stdout);
  } else if (first == "--version") {
    (void)fputs("fileindexctl " FERROX_VERSION "\n", stdout);
  } else if (first[0] == '-') {
    ThrowNoGlobalOption(first);
  } else {
    return false;
  }
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

/// Finds the command, parses its arguments, prepares the instance and runs it. Help needs no instance.
int Run(std::vector<std::string> words) {
  if (!words.empty() && words[0] == kCompleteCommand) return PrintCompletions({words.begin() + 1, words.end()});
  if (TakeGlobalOptions(words)) return kDone;
  if (words.empty()) {
    throw UsageError("a command is missing; for example: fileindexctl search invoice 2024\nTry 'fileindexctl help'.");
  }
  if (AsksForHelp(words)) {
    (void)fputs(HelpOn(WithoutHelp(words)).c_str(), stdout);
    return kDone;
  }
  size_t name_words = 0;
  const Command* command = FindCommand(words, name_words);
  if (command == nullptr) ThrowNoCommand(words);
  words.erase(words.begin(), words.begin() + static_cast<std::ptrdiff_t>(name_words));
  try {
    const Arguments arguments = ParseArguments(*command, words);
    if (arguments.Has("--help")) {
      (void)fputs(HelpFor(*command).c_str(), stdout);
      return kDone;
    }
    if (!IsPrivileged()) return RunForUser(*command, arguments);
    PrepareInstance(arguments.Has(kDryRun.name) ? Needs::kAnswers : command->needs);
    return command->run(arguments);
  } catch (const UsageError& error) {
    throw UsageError(WithUsage(*command, error.what()));
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
    (void)fprintf(stderr, "fileindexctl: %s\n", EscapeText(error.what()).c_str());
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
