#include "cli/watching.h"

#include <set>

#include "cli/escape.h"
#include "cli/format.h"
#include "common/clock.h"
#include "fileindex/operations/watch_list.h"

/// The notification daemon knows queues, not shares: its status is joined with that of the index daemon by the path of
/// the queue.
namespace ferrox::cli {

namespace {

/// The notification daemon's entry of the queue that this service registered, null when it has none.
Json::Value WatchOf(const Json::Value& notification_daemon, const std::string& queue) {
  if (queue.empty() || !notification_daemon.isObject()) return Json::Value();
  for (const Json::Value& entry : notification_daemon["queues"]) {
    if (TextOf(entry, "queue") == queue && TextOf(entry, "application") == fileindex::kAppName) return entry;
  }
  return Json::Value();
}

/// "by inotify (fanotify needs the capability CAP_SYS_ADMIN), not yet everywhere"
std::string HowNoticed(const Json::Value& folder) {
  const std::string watch = TextOf(folder, "watch");
  const std::string reason = TextOf(folder, "reason");
  const bool covered = BoolOf(folder, "covered");
  return (watch.empty() ? "are not noticed" : "by " + watch) + (reason.empty() ? "" : " (" + reason + ")") +
         (covered || watch.empty() ? "" : ", not yet everywhere");
}

/// Changes that cannot be written to the queue stay in the daemon's memory until they can.
std::string HeldLine(const Json::Value& watch) {
  if (UintOf(watch, "held") == 0) return "";
  const auto age = static_cast<double>(Clock::Get().Now() - IntOf(watch, "held_since"));
  const std::string reason = TextOf(watch, "held_reason");
  return "    held in memory: " + Count(UintOf(watch, "held")) + ", the oldest for " + Duration(age) +
         (reason.empty() ? "" : ": " + EscapeForTerminal(reason)) + "\n";
}

}  // namespace

void AddWatches(const Json::Value& notification_daemon, Json::Value& index_daemon) {
  if (!index_daemon.isObject()) return;
  for (Json::Value& share : index_daemon["shares"]) {
    share["watch"] = WatchOf(notification_daemon, TextOf(share, "queue"));
    // A change that the notification daemon holds is in no queue, so that the index daemon does not know of it.
    const int64_t held_since = IntOf(share["watch"], "held_since");
    const int64_t oldest = IntOf(share, "oldest_change");
    if (held_since != 0 && (oldest == 0 || held_since < oldest)) share["oldest_change"] = Json::Int64(held_since);
  }
}

/// One line where all folders of the share are watched alike, else one for each folder.
std::string WatchLines(const Json::Value& share, const std::string& daemon_problem) {
  constexpr char kNotNoticed[] = "    changes are not noticed, 'fileindexctl index' looks for them";
  const Json::Value& watch = share["watch"];
  if (!daemon_problem.empty()) return std::string(kNotNoticed) + ": the notification daemon " + daemon_problem + "\n";
  if (!watch.isObject() || watch["watches"].empty()) {
    return std::string(kNotNoticed) +
           ": its folders are not registered; 'fileindexctl folder set' registers them again\n";
  }
  std::set<std::string> ways;
  for (const Json::Value& folder : watch["watches"]) ways.insert(HowNoticed(folder));
  std::string lines;
  if (ways.size() == 1) lines = "    changes " + EscapeForTerminal(*ways.begin()) + "\n";
  for (const Json::Value& folder : watch["watches"]) {
    if (ways.size() == 1) break;
    lines += "    changes in " + EscapeForTerminal(TextOf(folder, "path")) + " " +
             EscapeForTerminal(HowNoticed(folder)) + "\n";
  }
  return lines + HeldLine(watch);
}

std::string NotificationDaemonText(const Json::Value& notification_daemon, bool needed) {
  if (!notification_daemon.isObject()) {
    return needed ? "does not run, so that changes are not noticed; start it with 'fileindexctl up'"
                  : "does not run; it starts with the first indexed folder";
  }
  std::string text = "runs, process " + std::to_string(IntOf(notification_daemon, "pid"));
  text += ", " + Count(UintOf(notification_daemon, "changes")) + " changes noticed";
  const uint64_t lost = UintOf(notification_daemon, "lost");
  if (lost != 0)
    text += "; the system lost some " + Count(lost) + " times, after which the folders were compared with the index";
  for (const Json::Value& problem : notification_daemon["problems"]) {
    if (problem.isString()) text += "\n    " + EscapeForTerminal(problem.asString());
  }
  return text;
}

}  // namespace ferrox::cli
