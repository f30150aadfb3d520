#pragma once

#include <string>

#include <json/value.h>

/// How changes on the disk are noticed, as the notification daemon tells it.
namespace ferrox::cli {

/// Puts what the notification daemon's status (null: it does not run) says of each share of the index daemon's beside
/// it: "watch", null where it says nothing, and in "oldest_change" the older of both.
void AddWatches(const Json::Value& notification_daemon, Json::Value& index_daemon);

/// Lines for people, each indented and ended, of a share with its "watch". `daemon_problem`: "" when the notification
/// daemon runs and answers, else what it does instead.
std::string WatchLines(const Json::Value& share, const std::string& daemon_problem);

/// What follows "notification daemon: "; further lines are indented.
std::string NotificationDaemonText(const Json::Value& notification_daemon, bool needed);

}  // namespace ferrox::cli
