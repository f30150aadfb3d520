#pragma once

#include <string>
#include <vector>

#include "cli/command.h"

namespace ferrox::cli {

struct CommandGroup {
  const char* title;
  std::vector<Command> commands;
};

/// All commands, in the order in which the help shows them.
const std::vector<CommandGroup>& CommandTable();

/// The command that the words begin with; null when there is none. `count` is how many words its name has.
const Command* FindCommand(const std::vector<std::string>& words, size_t& count);

// One function a command, in the files command_*.cpp. Each returns an exit code.
int RunUp(const Arguments& arguments);
int RunDown(const Arguments& arguments);
int RunPrepare(const Arguments& arguments);
int RunStatus(const Arguments& arguments);
int RunPause(const Arguments& arguments);
int RunResume(const Arguments& arguments);
int RunShareAdd(const Arguments& arguments);
int RunShareList(const Arguments& arguments);
int RunShareRemove(const Arguments& arguments);
int RunShareRename(const Arguments& arguments);
int RunShareMigrate(const Arguments& arguments);
int RunSharePause(const Arguments& arguments);
int RunShareResume(const Arguments& arguments);
int RunShareForget(const Arguments& arguments);
int RunShareCheckRecycle(const Arguments& arguments);
int RunVolumePause(const Arguments& arguments);
int RunVolumeResume(const Arguments& arguments);
int RunVolumeForget(const Arguments& arguments);
int RunHomeEnable(const Arguments& arguments);
int RunHomeDisable(const Arguments& arguments);
int RunUserRename(const Arguments& arguments);
int RunFolderAdd(const Arguments& arguments);
int RunFolderSet(const Arguments& arguments);
int RunFolderDelete(const Arguments& arguments);
int RunFolderReindex(const Arguments& arguments);
int RunFolderGet(const Arguments& arguments);
int RunFolderList(const Arguments& arguments);
int RunIndex(const Arguments& arguments);
int RunRebuild(const Arguments& arguments);
int RunSuggestRefresh(const Arguments& arguments);
int RunSearch(const Arguments& arguments);
int RunShow(const Arguments& arguments);
int RunUnread(const Arguments& arguments);
int RunQueueShow(const Arguments& arguments);

}  // namespace ferrox::cli
