#include "cli/command_table.h"

#include "cli/folder_exclusions.h"
#include "cli/share_commands.h"
#include "cli/token_commands.h"
#include "cli/user_commands.h"

/// The commands as data. A row that is added here has help, usage line, checks of its options and completion at once;
/// the manual (docs/man) must name it, too, which a test holds.
namespace ferrox::cli {

namespace {

/// Options of several commands.
const Option kJson = {"--json", nullptr, "one line of JSON, for scripts"};
const Option kAs = {"--as", "USER", "for root: what this user is shown; a user without an account as UID:GID,..."};
const Option kName = {"--name", "NAME", "what people call it (default: the last part of the path)"};

CommandGroup ServiceCommands() {
  return {"The service",
          {
              {"up",
               "",
               {{"--no-supervisor", nullptr, "nothing starts them again when they are killed"}},
               "Starts the service and waits until it answers.",
               &RunUp,
               Needs::kInstance},
              {"down", "", {}, "Stops the service.", &RunDown, Needs::kService},
              {"status",
               "[SHARE]",
               {kJson},
               "Shows what runs, and what is indexed, queued and failed, for each share or for one.",
               &RunStatus,
               Needs::kReading,
               &RunUserStatus},
              {"config show",
               "",
               {kJson},
               "Shows which files are left out of all indexed folders, or are indexed by name only.",
               &RunConfigShow,
               Needs::kReading},
              {"pause",
               "[HOURS]",
               {},
               "Pauses indexing, for some hours or until 'resume'. Searches still work.",
               &RunPause,
               Needs::kInstance},
              {"resume", "", {}, "Resumes indexing after 'pause'.", &RunResume, Needs::kInstance},
              {"prepare",
               "",
               {},
               "Starts what indexing needs if any folder is indexed, and stops it if none is. For start-up scripts.",
               &RunPrepare,
               Needs::kInstance},
          }};
}

CommandGroup Searching() {
  return {
      "Searching",
      {
          {"search",
           "QUERY...",
           {{"--share", "SHARE", "search in this share only; may be given several times"},
            kAs,
            {"--limit", "N", "show this many hits (default 10, at most 1000)"},
            {"--offset", "N", "skip the first N hits"},
            {"--sort", "relevance|date|name|size", "the order (default: relevance)"},
            {"--all-words", nullptr, "show only files that have all the words, if there are any"},
            {"--explain", nullptr, "show which words matched where in each hit, and what each added to its score"},
            {"--fresh", "[=SECONDS]",
             "wait until all earlier changes can be found (default 30); leaves out shares that take longer"},
            {"--partial", nullptr,
             "exit code 0 or 1 even if shares are left out; with --fresh, search those that take longer, too"},
            kJson},
           "Finds files by their names and contents, those with more and rarer words first. +word and \"a phrase\" "
           "must be "
           "there, -word must not. prefix*, OR, NOT and ( ) work, and conditions such as kind:image, size:>10M, "
           "author:, "
           "artist:, duration:>10m, camera:, taken:2023; 'man fileindexctl' lists all. Exit code 4: a share was left "
           "out.",
           &RunSearch,
           Needs::kReading,
           &RunUserSearch},
          {"suggest-refresh",
           "[SHARE...]",
           {},
           "Updates the spellings that are suggested when nothing is found, for these shares or for all.",
           &RunSuggestRefresh,
           Needs::kShares},
      }};
}

std::vector<Option> WithExclusions(std::vector<Option> options) {
  for (const Option& option : ExclusionOptions()) options.push_back(option);
  return options;
}

/// Of single folders.
std::vector<Command> FolderCommands() {
  const Option kinds = {"--kinds", "KINDS", "document, audio, video, photo, joined with commas; or all, or none"};
  Option needed_kinds = kinds;
  needed_kinds.is_needed = true;
  return {
      {"folder add", "PATH...", WithExclusions({kinds, kName, kDryRun, kDryRunJson}),
       "Indexes folders, with the content of all kinds of files unless --kinds says otherwise. Adds all of the folders "
       "or none.",
       &RunFolderAdd, Needs::kShares},
      {"folder set", "PATH...", WithExclusions({needed_kinds, kName}),
       "Changes which kinds of files are read in folders, and which files are left out. Adds folders that are not "
       "indexed yet.",
       &RunFolderSet, Needs::kShares},
      {"folder delete", "PATH...", {}, "Stops indexing folders. The files stay.", &RunFolderDelete, Needs::kShares},
      {"folder reindex",
       "PATH...",
       {},
       "Compares folders with the index and indexes what differs.",
       &RunFolderReindex,
       Needs::kShares},
      {"folder get", "PATH", {kJson}, "Shows the settings of an indexed folder.", &RunFolderGet, Needs::kAnswers},
      {"folder list",
       "",
       {{"--status", nullptr, "also show the state of each"},
        {"--sort", "path|document|audio|video|photo", "the order (default: as they were added)"},
        {"--desc", nullptr, "in reverse order"},
        {"--offset", "N", "skip the first N"},
        {"--limit", "N", "show this many"},
        kJson},
       "Lists the indexed folders.",
       &RunFolderList},
  };
}

/// Of whole shares.
std::vector<Command> IndexCommands() {
  return {
      {"index",
       "SHARE",
       {{"--wait", nullptr, "wait until it is done, and show progress"}},
       "Compares a share with its index and indexes what differs.",
       &RunIndex,
       Needs::kShares},
      {"rebuild",
       "SHARE",
       {{"--wait", nullptr, "wait until it is done, and show progress"}},
       "Builds the index of a share again from its files. Meanwhile searches find what has been indexed so far.",
       &RunRebuild,
       Needs::kShares},
  };
}

CommandGroup Inspection() {
  return {"Looking inside",
          {
              {"show",
               "FILE...",
               {kAs,
                {"--text", nullptr, "only its text, in full"},
                {"--json", nullptr, "one JSON object a line, for scripts"}},
               "Shows what the index holds of a file, or why the file is not indexed.",
               &RunShow,
               Needs::kAnswers,
               &RunUserShow},
              {"unread",
               "[SHARE...]",
               {{"--json", nullptr, "one JSON object a line, for scripts"}},
               "Lists the files whose content could not be read, or only in part, with the reason.",
               &RunUnread,
               Needs::kAnswers},
              {"queue show",
               "FILE",
               {{"--json", nullptr, "one JSON object a line, for scripts"}},
               "Prints the operations that wait in a queue file, one a line. Changes nothing.",
               &RunQueueShow,
               Needs::kNothing},
          }};
}

/// Both lists as one.
std::vector<Command> Joined(std::vector<Command> first, const std::vector<Command>& second) {
  (void)first.insert(first.end(), second.begin(), second.end());
  return first;
}

}  // namespace

const std::vector<CommandGroup>& CommandTable() {
  static const std::vector<CommandGroup> table = {ServiceCommands(),
                                                  Searching(),
                                                  {"What is indexed", Joined(FolderCommands(), IndexCommands())},
                                                  {"Shares", ShareCommands()},
                                                  {"Volumes, homes, users", HostEventCommands()},
                                                  TokenCommands(),
                                                  Inspection()};
  return table;
}

const Command* FindCommand(const std::vector<std::string>& words, size_t& count) {
  for (const CommandGroup& group : CommandTable()) {
    for (const Command& command : group.commands) {
      const std::string name = command.name;
      count = name.find(' ') == std::string::npos ? 1 : 2;
      if (words.size() >= count && name == (count == 1 ? words[0] : words[0] + " " + words[1])) return &command;
    }
  }
  return nullptr;
}

}  // namespace ferrox::cli
