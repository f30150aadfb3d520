#include "cli/command_table.h"

#include "cli/user_commands.h"

/// The commands as data. A row that is added here has help, usage line, checks of its options and completion at once;
/// the manual (docs/man) must name it, too, which a test holds.
namespace ferrox::cli {

namespace {

/// Options of several commands.
const Option kJson = {"--json", nullptr, "one line of JSON for scripts"};
const Option kAccounts = {"--accounts", "local|domain|ldap", "whose homes (default local)"};
const Option kAs = {"--as", "USER", "what this user finds, for root; one without account as UID:GID,..."};
const Option kName = {"--name", "NAME", "what people call it (default: the last part of the path)"};

CommandGroup ServiceCommands() {
  return {"The service",
          {
              {"up",
               "",
               {{"--no-supervisor", nullptr, "leave nothing that starts them again when they are killed"}},
               "Starts the search engine, the notification daemon and the index daemon, and waits until they answer.",
               &RunUp,
               Needs::kInstance},
              {"down", "", {}, "Stops them.", &RunDown, Needs::kService},
              {"status",
               "",
               {kJson},
               "Shows what runs, and for each share what is indexed, queued and failed.",
               &RunStatus,
               Needs::kReading,
               &RunUserStatus},
              {"pause",
               "[HOURS]",
               {},
               "Pauses indexing, for some hours or until 'resume'. Searching goes on.",
               &RunPause,
               Needs::kInstance},
              {"resume", "", {}, "Ends a pause.", &RunResume, Needs::kInstance},
              {"prepare",
               "",
               {},
               "Starts the services that indexing needs when folders are indexed, else stops them.",
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
            {"--limit", "N", "show at most so many hits (default 10, at most 1000)"},
            {"--offset", "N", "leave out the first N hits"},
            {"--sort", "relevance|date|name|size", "the order (default: relevance)"},
            {"--all-words", nullptr, "show only files with all the words, if there are any"},
            {"--explain", nullptr, "tell for each hit which words matched where, and what each added to its score"},
            {"--fresh", "[=SECONDS]",
             "wait until all that was changed before can be found (default 30); leaves out what is not sure"},
            {"--partial", nullptr, "exit code 0 or 1 whatever is left out; with --fresh shows what is not sure too"},
            kJson},
           "Finds files, those with more and rarer ones of the words first. +word and \"a phrase\" must be there, "
           "-word "
           "must not; prefix*, OR, NOT and ( ) work, and conditions such as "
           "kind:image, size:>10M, author:, artist:, duration:>10m, camera:, taken:2023; the manual lists all. "
           "Exit code 4: a share was left out.",
           &RunSearch,
           Needs::kReading,
           &RunUserSearch},
          {"suggest-refresh",
           "[SHARE...]",
           {},
           "Rebuilds what is suggested while a query is typed, for these shares or for all.",
           &RunSuggestRefresh,
           Needs::kShares},
      }};
}

/// Of single folders.
std::vector<Command> FolderCommands() {
  const Option kinds = {"--kinds", "KINDS", "document, audio, video, photo, joined with commas; or all, or none"};
  return {
      {"folder add",
       "PATH...",
       {kinds, kName},
       "Has folders indexed: all kinds of files, unless told otherwise. All of the folders, or none.",
       &RunFolderAdd,
       Needs::kShares},
      {"folder set",
       "PATH...",
       {kinds, kName},
       "Changes of which kinds of files the content is indexed (--kinds is needed); adds what is missing.",
       &RunFolderSet,
       Needs::kShares},
      {"folder delete",
       "PATH...",
       {},
       "Ends the indexing of folders; the files stay. With the last folder of all, indexing stops.",
       &RunFolderDelete,
       Needs::kShares},
      {"folder reindex",
       "PATH...",
       {},
       "Has folders compared with the index; what differs is indexed.",
       &RunFolderReindex,
       Needs::kShares},
      {"folder get", "PATH", {kJson}, "Shows one indexed folder.", &RunFolderGet, Needs::kAnswers},
      {"folder list",
       "",
       {{"--status", nullptr, "also what each does now"},
        {"--sort", "path|document|audio|video|photo", "the order (default: as they were added)"},
        {"--desc", nullptr, "the other way round"},
        {"--offset", "N", "leave out the first N"},
        {"--limit", "N", "show at most so many"},
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
       "Has a share compared with its index; what differs is indexed.",
       &RunIndex,
       Needs::kShares},
      {"rebuild",
       "SHARE",
       {{"--wait", nullptr, "wait until it is done, and show progress"}},
       "Makes the index of a share anew and reads all its files. Searches find what is indexed by then.",
       &RunRebuild,
       Needs::kShares},
  };
}

/// What changes the table of shares.
std::vector<Command> ShareTableCommands() {
  return {
      {"share add",
       "FOLDER",
       {{"--name", "NAME", "the share's name (default: the folder's last component, which it must equal)"},
        {"--replace", nullptr, "an earlier share of that name, with another folder, makes way"},
        {"--no-index", nullptr, "do not index it; 'folder add' chooses what is"}},
       "Makes a folder a share and has all of it indexed.",
       &RunShareAdd,
       Needs::kShares},
      {"share list", "", {kJson}, "Lists the shares: name and folder.", &RunShareList},
      {"share remove",
       "SHARE",
       {},
       "Ends a share and drops its index; the folder and its files stay.",
       &RunShareRemove,
       Needs::kShares},
      {"share rename",
       "SHARE NEW_NAME",
       {},
       "Renames a share and its folder; its index follows.",
       &RunShareRename,
       Needs::kShares},
      {"share migrate",
       "SHARE NEW_FOLDER",
       {{"--from", "FOLDER", "where it was, of a share of Samba or to finish an interrupted run"}},
       "Tells that a share's folder has been moved, for example to another volume; its index follows.",
       &RunShareMigrate,
       Needs::kShares},
  };
}

/// What changes how a share is indexed, and leaves it where it is.
std::vector<Command> ShareStateCommands() {
  return {
      {"share pause", "SHARE", {}, "Stops the indexing of a share.", &RunSharePause, Needs::kShares},
      {"share resume",
       "SHARE",
       {},
       "Goes on with a share; what has changed meanwhile is indexed.",
       &RunShareResume,
       Needs::kShares},
      {"share forget",
       "SHARE [FOLDER]",
       {},
       "Drops the index of a paused share that does not come back; its folder is needed when it is gone.",
       &RunShareForget,
       Needs::kShares},
      {"share check-recycle",
       "SHARE",
       {},
       "Looks at a share's recycle bin again, after it was switched on or off.",
       &RunShareCheckRecycle,
       Needs::kShares},
  };
}

/// Events of the host that the index follows: sent by its administrator or by the host's own scripts.
CommandGroup HostEvents() {
  return {"Volumes, homes, users",
          {
              {"volume pause",
               "MOUNT_POINT",
               {},
               "Stops the indexing of all folders on a volume that goes away.",
               &RunVolumePause,
               Needs::kShares},
              {"volume resume", "MOUNT_POINT", {}, "Goes on with them.", &RunVolumeResume, Needs::kShares},
              {"volume forget",
               "MOUNT_POINT",
               {},
               "Drops the paused folders of a volume that does not come back.",
               &RunVolumeForget,
               Needs::kShares},
              {"home enable",
               "",
               {kAccounts},
               "Tells that the users' home folders were switched on.",
               &RunHomeEnable,
               Needs::kShares},
              {"home disable",
               "",
               {kAccounts},
               "Tells that the users' home folders were switched off.",
               &RunHomeDisable,
               Needs::kShares},
              {"user rename",
               "OLD NEW",
               {},
               "Tells that a user, and the folder in the share \"homes\", has another name.",
               &RunUserRename,
               Needs::kShares},
          }};
}

CommandGroup Inspection() {
  return {"Looking inside",
          {
              {"show",
               "FILE...",
               {kAs, {"--text", nullptr, "its text alone, whole"}, {"--json", nullptr, "one JSON object a line"}},
               "Shows what the index holds of a file: what was read, by which reader, all fields, and the text's "
               "beginning.",
               &RunShow,
               Needs::kAnswers,
               &RunUserShow},
              {"unread",
               "[SHARE...]",
               {{"--json", nullptr, "one JSON object a line"}},
               "Lists the files that could not be read, or not all of them, each with the reason.",
               &RunUnread,
               Needs::kAnswers},
              {"queue show",
               "FILE",
               {{"--json", nullptr, "one JSON object a line"}},
               "Prints the operations that a queue file asks for, one a line; changes nothing.",
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
                                                  {"Shares", Joined(ShareTableCommands(), ShareStateCommands())},
                                                  HostEvents(),
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
