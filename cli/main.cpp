#include <stdlib.h>
#include <unistd.h>

#include <clocale>
#include <cstdio>
#include <iterator>

#include "cli/command.h"
#include "cli/escape.h"
#include "common/error.h"
#include "common/log.h"
#include "common/paths.h"
#include "services/support/daemon.h"

#ifndef FERROX_VERSION
#define FERROX_VERSION "unknown"
#endif

namespace {

using namespace ferrox::cli;  // NOLINT: the tool's own

const Option kJson = {"--json", nullptr, "one line of JSON for scripts"};

const Command kCommands[] = {
    {"up", "", 0, 0, {}, "Starts the search engine and the index daemon, and waits until they answer.", &RunUp, true},
    {"down", "", 0, 0, {}, "Stops both.", &RunDown},
    {"status",
     "",
     0,
     0,
     {kJson},
     "Shows what runs, and for each share what is indexed, queued and failed.",
     &RunStatus},
    {"share add",
     "FOLDER",
     1,
     1,
     {{"--name", "NAME", "the share's name (default: the folder's last component, which it must equal)"},
      {"--replace", nullptr, "an earlier share of that name, with another folder, makes way"}},
     "Makes a folder a share and has it indexed.",
     &RunShareAdd,
     true},
    {"share list", "", 0, 0, {kJson}, "Lists the shares: name and folder.", &RunShareList},
    {"share remove",
     "SHARE",
     1,
     1,
     {},
     "Ends a share and drops its index; the folder and its files stay.",
     &RunShareRemove},
    {"index",
     "SHARE",
     1,
     1,
     {{"--wait", nullptr, "wait until it is done, and show progress"}},
     "Has a share compared with its index; what differs is indexed.",
     &RunIndex,
     true},
    {"search",
     "QUERY...",
     1,
     1000,
     {{"--share", "S", "search in this share only"},
      {"--limit", "N", "show at most so many hits (default 10, at most 1000)"},
      {"--offset", "N", "leave out the first N hits"},
      {"--sort", "KEY", "relevance (default), date, name or size"},
      kJson},
     "Finds files. All words must match; \"a phrase\", prefix*, OR, NOT, ( ), kind:, ext:, path:, size: and date: "
     "work.",
     &RunSearch},
    {"pause",
     "[HOURS]",
     0,
     1,
     {},
     "Pauses indexing, for some hours or until 'resume'. Searching goes on.",
     &RunPause,
     true},
    {"resume", "", 0, 0, {}, "Ends a pause.", &RunResume, true},
    {"queue show",
     "FILE",
     1,
     1,
     {{"--json", nullptr, "one JSON object a line"}},
     "Prints the operations that a queue file asks for, one a line; changes nothing.",
     &RunQueueShow},
};

std::string Overview() {
  std::string text =
      "Usage: fileindexctl [--root DIR] COMMAND ...\n"
      "Searches the contents of folders, and looks after what that needs.\n\n";
  for (const Command& command : kCommands) {
    const std::string left = std::string(command.name) + " " + command.words;
    text += "  " + left + std::string(left.size() < 22 ? 22 - left.size() : 1, ' ') + command.help + "\n";
  }
  return text +
         "\n  --root DIR   the instance's folder (default: the environment variable FERROX_ROOT, else the host's own)\n"
         "  --version    the version\n"
         "  --help       this text, or after a command that command's help\n"
         "Exit codes: 0 done, 1 nothing found, 2 wrong usage, 3 failure.\n";
}

/// The command that the words begin with, which are then taken away; null when there is none.
const Command* TakeCommand(std::vector<std::string>& words) {
  for (const Command& command : kCommands) {
    const std::string name = command.name;
    const size_t count = name.find(' ') == std::string::npos ? 1 : 2;
    if (words.size() < count || name != (count == 1 ? words[0] : words[0] + " " + words[1])) continue;
    words.erase(words.begin(), words.begin() + static_cast<std::ptrdiff_t>(count));
    return &command;
  }
  return nullptr;
}

void UseRoot(const std::string& root) {
  std::string absolute = root;
  if (root.empty()) throw UsageError("--root needs a folder");
  if (root[0] != '/') {
    char folder[4096];
    if (getcwd(folder, sizeof(folder)) == nullptr)
      throw Failure("the working folder cannot be told; give --root a path that begins with /");
    absolute = std::string(folder) + "/" + root;
  }
  (void)setenv("FERROX_ROOT", absolute.c_str(), 1);
}

/// Takes the options that stand before the command. True when one of them has done all there was to do.
bool TakeGlobalOptions(std::vector<std::string>& words) {
  while (!words.empty() && words[0].compare(0, 2, "--") == 0) {
    if (words[0] == "--help" || words[0] == "--version") {
      (void)fputs(words[0] == "--help" ? Overview().c_str() : "fileindexctl " FERROX_VERSION "\n", stdout);
      return true;
    }
    if (words[0].compare(0, 7, "--root=") == 0) {
      UseRoot(words[0].substr(7));
    } else if (words[0] == "--root" && words.size() > 1) {
      words.erase(words.begin());
      UseRoot(words[0]);
    } else {
      throw UsageError(words[0] == "--root" ? "--root needs a folder" : "unknown option " + words[0]);
    }
    words.erase(words.begin());
  }
  return false;
}

/// An instance of its own begins as an empty folder; the host's own has its folders from its package.
void PrepareInstance(bool changes) {
  const std::string problem = ferrox::InstanceRootProblem();
  if (!problem.empty()) throw Failure(problem);
  if (!changes || ferrox::InstancePath("").empty()) return;
  for (const char* folder : {"/tmp", "/var/run", ferrox::kConfigurationFolder}) {
    const std::string path = ferrox::InstancePath(folder);
    if (!ferrox::services::MakeFolders(path)) throw Failure("cannot make " + path + ": " + ferrox::ErrnoText());
  }
}

int Run(std::vector<std::string> words) {
  if (TakeGlobalOptions(words)) return kDone;
  if (words.empty()) throw UsageError("say what to do");
  const Command* command = TakeCommand(words);
  if (command == nullptr) throw UsageError("there is no command \"" + words[0] + "\"");
  try {
    const Arguments arguments = ParseArguments(*command, words);
    if (arguments.Has("--help")) {
      (void)fputs(HelpFor(*command).c_str(), stdout);
      return kDone;
    }
    PrepareInstance(command->changes);
    return command->run(arguments);
  } catch (const UsageError& error) {
    throw UsageError(std::string(error.what()) + "\nUsage: " + UsageLine(*command));
  }
}

}  // namespace

int main(int argc, char** argv) {
  (void)setlocale(LC_CTYPE, "");
  try {
    const int code = Run({argv + 1, argv + argc});
    if (fflush(stdout) != 0) throw Failure("standard output cannot be written");
    return code;
  } catch (const UsageError& error) {
    (void)fprintf(stderr, "fileindexctl: %s\nTry 'fileindexctl --help'.\n", error.what());
    return kWrongUsage;
  } catch (const ferrox::Error& error) {
    (void)fprintf(stderr, "fileindexctl: %s (error %d)\n", EscapeForTerminal(error.what()).c_str(), error.Code());
  } catch (const std::exception& error) {
    (void)fprintf(stderr, "fileindexctl: %s\n", EscapeForTerminal(error.what()).c_str());
  }
  return kFailure;
}
