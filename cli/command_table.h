#pragma once

#include <string>
#include <vector>

#include "cli/command.h"

namespace ferrox::cli {

/// Commands of one subject; the help shows them under the title.
struct CommandGroup {
  const char* title;
  std::vector<Command> commands;
};

/// Options of the commands that show what they would do (preview.h).
inline const Option kDryRun = {"--dry-run", nullptr, "only count what would be indexed, and change nothing"};
inline const Option kDryRunJson = {"--json", nullptr, "with --dry-run: one line of JSON for each folder, for scripts"};

/// All commands, in the order in which the help shows them.
const std::vector<CommandGroup>& CommandTable();

/// The command that the words begin with; null when there is none. `count` is how many words its name has: 1 or 2. No
/// command has the first word of another's two for its name, so that the order of the table does not matter.
const Command* FindCommand(const std::vector<std::string>& words, size_t& count);

// One function a command, in the files command_*.cpp. Each checks its words, carries the command out, prints what has
// become of it, and returns an exit code.

// command_service.cpp, command_status.cpp
int RunUp(const Arguments& arguments);
int RunDown(const Arguments& arguments);
int RunPrepare(const Arguments& arguments);
int RunStatus(const Arguments& arguments);
int RunConfigShow(const Arguments& arguments);
int RunPause(const Arguments& arguments);
int RunResume(const Arguments& arguments);

// command_share.cpp: the table of shares; command_share_move.cpp: rename and migrate
int RunShareAdd(const Arguments& arguments);
int RunShareList(const Arguments& arguments);
int RunShareRemove(const Arguments& arguments);
int RunShareRename(const Arguments& arguments);
int RunShareMigrate(const Arguments& arguments);

// command_lifecycle.cpp, command_volume.cpp: what happens to shares, volumes, homes and users
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

// command_folder.cpp, command_index.cpp: what is indexed, and the comparison with the index
int RunFolderAdd(const Arguments& arguments);
int RunFolderSet(const Arguments& arguments);
int RunFolderDelete(const Arguments& arguments);
int RunFolderReindex(const Arguments& arguments);
int RunFolderGet(const Arguments& arguments);
int RunFolderList(const Arguments& arguments);
int RunIndex(const Arguments& arguments);
int RunRebuild(const Arguments& arguments);
int RunSuggestRefresh(const Arguments& arguments);

// command_search.cpp, command_show.cpp, command_queue.cpp: what is in indices and queues
int RunSearch(const Arguments& arguments);
int RunShow(const Arguments& arguments);
int RunUnread(const Arguments& arguments);
int RunQueueShow(const Arguments& arguments);

}  // namespace ferrox::cli
