#pragma once

#include <chrono>
#include <map>
#include <string>
#include <vector>

#include <json/value.h>

/// Requests to the daemons of this instance (docs/formats/engine.md, daemon.md, notifyd.md), and what to say when one
/// is not answered. Each call is a connection of its own and blocks until the reply is there: at most 120 s, since some
/// commands wait for other work, a search 20 s, a status 5 s.
namespace ferrox::cli {

/// Sends one request to a daemon of this instance and returns the reply's "data"; the engine's requests are
/// those of wire/engine_requests.h.
/// @throws Failure when the daemon does not run or does not answer; Refusal with its own message and code when it
/// refuses; NotPermitted when its socket, or the daemon, does not take requests of the calling user.
Json::Value AskEngine(const Json::Value& request);
/// The same, waiting no longer than this.
Json::Value AskEngine(const Json::Value& request, std::chrono::seconds longest);
/// The engine's "search".
Json::Value Search(const Json::Value& data);
Json::Value AskIndexDaemon(const std::string& type, const Json::Value& data);

/// The same, but null when the daemon does not run: for what it will see by itself when it starts.
Json::Value AskIndexDaemonIfRunning(const std::string& type, const Json::Value& data);

/// What a daemon says of itself. Null and "" together: it does not run.
struct DaemonState {
  Json::Value status;   ///< its reply; null when there is none
  std::string problem;  ///< why it runs and there is no reply, with the remedy
};
/// The same of all.
struct InstanceState {
  DaemonState engine;
  DaemonState index_daemon;
  DaemonState notification_daemon;
  DaemonState content_extraction;
  DaemonState access_check;
  DaemonState web;
};
/// Asks all daemons at once and waits for each at most 5 s, so that one that hangs hides nothing of the others.
/// @throws NotPermitted.
InstanceState AskAll();

/// Why changes are not noticed or not indexed now, so that the index may be behind; empty when both daemons run.
std::string NotNoticed();

/// Waits until what was changed before this call in the shares (none named: in all that are worked on) is in the index:
/// first the notification daemon has everything that the system reported in the queues, then the index daemon has the
/// queues in the index. @return the shares of which that cannot be said, by name, each with reason and remedy.
/// @throws Failure, with reason and remedy, when it can be said of none of them, or within `longest` of none.
std::map<std::string, std::string> AwaitChanges(const std::vector<std::string>& shares, std::chrono::seconds longest);

/// For operations that need a daemon at their end: better nothing is begun without it.
/// @throws Failure when it does not run or does not answer.
void RequireEngine();
void RequireIndexDaemon();
void RequireDaemons();  ///< both

/// Has the index daemon, if it runs, load the folders of a share again, and begin, keep or end its work on it.
void NotifySettingChanged(const std::string& share);

/// {"share_name": name}: the data of the index daemon's commands.
Json::Value ShareName(const std::string& name);
/// A share's entry in the index daemon's status; null when the daemon has none of it or `status` is null.
Json::Value ShareIn(const Json::Value& status, const std::string& share);

}  // namespace ferrox::cli
