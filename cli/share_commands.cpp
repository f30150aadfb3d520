#include "cli/share_commands.h"

#include "cli/command_table.h"

namespace ferrox::cli {

/// First what changes the table of shares, then what changes how a share is indexed.
std::vector<Command> ShareCommands() {
  const Option json = {"--json", nullptr, "one line of JSON, for scripts"};
  return {
      {"share add",
       "FOLDER",
       {{"--name", "NAME", "the share's name (default: the last part of the folder's path; it can be no other)"},
        {"--replace", nullptr, "replace a share of that name that has another folder"},
        {"--no-index", nullptr, "do not index it; 'folder add' then chooses what is indexed"},
        kDryRun,
        kDryRunJson},
       "Makes a folder a share and indexes all of it.",
       &RunShareAdd,
       Needs::kShares},
      {"share list", "", {json}, "Lists the shares and their folders.", &RunShareList},
      {"share remove",
       "SHARE",
       {},
       "Removes a share and its index. The folder and its files stay.",
       &RunShareRemove,
       Needs::kShares},
      {"share rename",
       "SHARE NEW_NAME",
       {},
       "Renames a share and its folder. Its index follows.",
       &RunShareRename,
       Needs::kShares},
      {"share migrate",
       "SHARE NEW_FOLDER",
       {{"--from", "FOLDER", "where it was before: for a share of Samba, or to finish an interrupted run"}},
       "Records that a share's folder was moved, for example to another volume. Its index follows.",
       &RunShareMigrate,
       Needs::kShares},
      {"share pause", "SHARE", {}, "Pauses the indexing of a share.", &RunSharePause, Needs::kShares},
      {"share resume",
       "SHARE",
       {},
       "Resumes the indexing of a share, with what has changed meanwhile.",
       &RunShareResume,
       Needs::kShares},
      {"share forget",
       "SHARE [FOLDER]",
       {},
       "Deletes the index of a paused share that will not come back.",
       &RunShareForget,
       Needs::kShares},
      {"share check-recycle",
       "SHARE",
       {},
       "Checks a share's recycle bin again, after it was switched on or off.",
       &RunShareCheckRecycle,
       Needs::kShares},
  };
}

/// What the host's administrator, or its own scripts, tell the index.
std::vector<Command> HostEventCommands() {
  const Option accounts = {"--accounts", "local|domain|ldap", "whose homes (default local)"};
  return {
      {"volume pause",
       "MOUNT_POINT",
       {},
       "Pauses all folders on a volume before it is removed.",
       &RunVolumePause,
       Needs::kShares},
      {"volume resume",
       "MOUNT_POINT",
       {},
       "Resumes the folders of a volume that is back.",
       &RunVolumeResume,
       Needs::kShares},
      {"volume forget",
       "MOUNT_POINT",
       {},
       "Deletes the indexes of a volume that will not come back.",
       &RunVolumeForget,
       Needs::kShares},
      {"home enable",
       "",
       {accounts},
       "Records that the users' home folders were switched on.",
       &RunHomeEnable,
       Needs::kShares},
      {"home disable",
       "",
       {accounts},
       "Records that the users' home folders were switched off.",
       &RunHomeDisable,
       Needs::kShares},
      {"user rename",
       "OLD NEW",
       {},
       "Records that a user, and the user's folder in the share \"homes\", was renamed.",
       &RunUserRename,
       Needs::kShares},
  };
}

}  // namespace ferrox::cli
