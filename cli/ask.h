#pragma once

#include <chrono>
#include <map>
#include <string>
#include <vector>

#include <json/value.h>

namespace ferrox::cli {

/// Sends one request to a daemon of this instance and returns the reply's "data".
/// @throws Failure when the daemon does not run or does not answer, or with its own message when it refuses.
Json::Value AskEngine(const std::string& command, const Json::Value& data);
Json::Value Search(const Json::Value& data);
Json::Value AskIndexDaemon(const std::string& type, const Json::Value& data);

/// The same, but null when the daemon does not run.
Json::Value AskIndexDaemonIfRunning(const std::string& type, const Json::Value& data);

/// What a daemon says of itself.
struct DaemonState {
  Json::Value status;   ///< its reply; null when there is none
  std::string problem;  ///< why it runs and there is no reply, with the remedy
};
struct InstanceState {
  DaemonState engine;
  DaemonState index_daemon;
  DaemonState notification_daemon;
  DaemonState content_extraction;
};
/// Asks all daemons at once and waits for each at most 5 s, so that one that hangs hides nothing of the others.
/// @throws NotPermitted.
InstanceState AskAll();

/// Why changes are not noticed or not indexed now, so that the index may be behind; empty when both daemons run.
std::string NotNoticed();

/// Waits until what was changed before in the shares (none named: in all that are worked on) is in the index. @return
/// the shares of which that cannot be said, each with reason and remedy.
/// @throws Failure, with reason and remedy, when it can be said of none of them.
std::map<std::string, std::string> AwaitChanges(const std::vector<std::string>& shares, std::chrono::seconds longest);

/// For operations that need a daemon at their end: better nothing is begun without it.
/// @throws Failure when it does not run or does not answer.
void RequireEngine();
void RequireIndexDaemon();
void RequireDaemons();  ///< both

/// Has the index daemon, if it runs, look again at what it is to do for a share.
void NotifySettingChanged(const std::string& share);

/// {"share_name": name}: the data of the index daemon's commands.
Json::Value ShareName(const std::string& name);
/// {"id": ...}: the data of the engine's commands that are about the index of one share.
Json::Value IndexOf(const std::string& share);
/// A share's entry in the index daemon's status; null when the daemon has none of it or `status` is null.
Json::Value ShareIn(const Json::Value& status, const std::string& share);

}  // namespace ferrox::cli
