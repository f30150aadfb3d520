#include "cli/ask.h"

#include <future>

#include "cli/caller.h"
#include "cli/command.h"
#include "cli/format.h"
#include "cli/rights.h"
#include "cli/web_client.h"
#include "common/error.h"
#include "common/paths.h"
#include "wire/await_changes.h"
#include "wire/engine_requests.h"
#include "wire/frame_client.h"

namespace ferrox::cli {

namespace {

using wire::Outcome;

/// A command that must first wait for other work still answers within this.
constexpr std::chrono::seconds kLongestWait(120);
/// Somebody waits at a terminal: an engine that takes longer than this hangs.
constexpr std::chrono::seconds kSearchWait(20);
/// A status is answered from memory.
constexpr std::chrono::seconds kStateWait(5);

/// How a daemon is reached, and how it is called where it fails.
struct Daemon {
  const char* name;  ///< as sentences begin with it
  const char* socket;
  int unreachable;  ///< what the library throws when it cannot reach it
};
constexpr Daemon kEngine = {"the search engine", kElasticdSocket, Error::kEngineUnreachable};
constexpr Daemon kIndexDaemon = {"the index daemon", kFileIndexdSocket, Error::kInternal};
constexpr Daemon kNotificationDaemon = {"the notification daemon", kNotifydSocket, Error::kInternal};
constexpr Daemon kContentExtraction = {"content extraction", kContentExtractdSocket, Error::kInternal};
constexpr Daemon kAccessCheck = {"the access check", kAccessSocket, Error::kInternal};

/// Of a daemon that took the connection and let the time pass.
constexpr char kNoAnswer[] = "does not answer; see its log, or restart it ('fileindexctl down', 'up')";

/// The reply's data, or what the user can do about there being none.
/// @throws Refusal, Failure, NotPermitted.
Json::Value DataOf(const Daemon& daemon, wire::Reply reply) {
  const std::string name = daemon.name;
  const std::string code = " (error " + std::to_string(daemon.unreachable) + ")";
  switch (reply.outcome) {
    case Outcome::kAnswered:
      return std::move(reply.data);
    case Outcome::kNotRunning:
      throw Failure(name + " does not run here (nothing answers at " + InstancePath(daemon.socket) + "); " +
                    (IsPrivileged() ? "start it" : "its administrator can start it") + " with 'fileindexctl up'" +
                    code);
    case Outcome::kNotPermitted:
      throw MayNotConnect(InstancePath(daemon.socket));
    case Outcome::kNoAnswer:
    case Outcome::kPeerClosed:
      throw Failure(name + " " + kNoAnswer + code);
    case Outcome::kUnreadable:
      throw Failure(name + " gave an answer that cannot be read; restart it ('fileindexctl down', 'up')");
    case Outcome::kRefused:
      break;
  }
  if (reply.code == Error::kEngineNotPermitted) {
    // The engine says to whom its answer is not given; the other daemons answer root and the instance's owner alone.
    if (daemon.socket == kEngine.socket && !reply.message.empty()) throw NotPermitted(reply.message);
    throw MayNot("use", InstancePath(daemon.socket));
  }
  throw Refusal(daemon.name, reply.code, reply.message.empty() ? "the request failed" : reply.message);
}

/// Of the daemons that take the library's commands.
wire::Reply SendCommand(const Daemon& daemon, const std::string& type, const Json::Value& data,
                        std::chrono::seconds longest = kLongestWait) {
  return wire::AskDaemon(daemon.socket, type, data, longest);
}

/// A daemon that does not run has neither a status nor a problem: whether that matters depends on what is indexed.
DaemonState StateFrom(const Daemon& daemon, wire::Reply reply) try {
  if (reply.outcome == Outcome::kNotRunning) return {};
  if (reply.outcome == Outcome::kNoAnswer || reply.outcome == Outcome::kPeerClosed) return {Json::Value(), kNoAnswer};
  return {DataOf(daemon, std::move(reply)), ""};
} catch (const Failure& failure) {
  return {Json::Value(), failure.what()};
}

/// The engine has no command "status"; its answer to "ping" says the same.
DaemonState EngineState() { return StateFrom(kEngine, wire::AskEngine(wire::EngineRequest("ping"), kStateWait)); }

DaemonState WebState() {
  const WebReply reply = AskWebDaemon("GET", "/api/v1/status", Json::Value(), kStateWait);
  if (reply.outcome == WebReply::Outcome::kNotRunning) return {};
  if (reply.outcome == WebReply::Outcome::kAnswered && reply.status == 200) return {reply.body, ""};
  return {Json::Value(), kNoAnswer};
}

DaemonState StateOf(const Daemon& daemon) {
  return StateFrom(daemon, SendCommand(daemon, "status", Json::Value(), kStateWait));
}

}  // namespace

Json::Value AskEngine(const Json::Value& request, std::chrono::seconds longest) {
  return DataOf(kEngine, wire::AskEngine(request, longest));
}

Json::Value AskEngine(const Json::Value& request) { return AskEngine(request, kLongestWait); }

Json::Value Search(const Json::Value& data) { return AskEngine(wire::EngineRequest("search", data), kSearchWait); }

Json::Value AskIndexDaemon(const std::string& type, const Json::Value& data) {
  return DataOf(kIndexDaemon, SendCommand(kIndexDaemon, type, data));
}

Json::Value AskIndexDaemonIfRunning(const std::string& type, const Json::Value& data) {
  wire::Reply reply = SendCommand(kIndexDaemon, type, data);
  return reply.outcome == Outcome::kNotRunning ? Json::Value() : DataOf(kIndexDaemon, std::move(reply));
}

/// One thread for each daemon but the engine, which this one asks. Each thread ends within kStateWait.
InstanceState AskAll() {
  const auto ask = [](const Daemon& daemon) { return std::async(std::launch::async, &StateOf, std::cref(daemon)); };
  auto index_daemon = ask(kIndexDaemon);
  auto notification_daemon = ask(kNotificationDaemon);
  auto content_extraction = ask(kContentExtraction);
  auto access_check = ask(kAccessCheck);
  auto web = std::async(std::launch::async, &WebState);
  InstanceState state;
  state.engine = EngineState();
  state.index_daemon = index_daemon.get();
  state.notification_daemon = notification_daemon.get();
  state.content_extraction = content_extraction.get();
  state.access_check = access_check.get();
  state.web = web.get();
  return state;
}

/// Only connects, so that a search is not held up by a daemon that is busy.
std::string NotNoticed() {
  for (const Daemon& daemon : {kNotificationDaemon, kIndexDaemon}) {
    if (wire::IsServed(InstancePath(daemon.socket))) continue;
    return std::string(daemon.name) + " does not run, so recent changes may be missing; start it with " +
           "'fileindexctl up'";
  }
  return {};
}

std::map<std::string, std::string> AwaitChanges(const std::vector<std::string>& shares, std::chrono::seconds longest) {
  wire::ChangesReport report = wire::AwaitChanges(shares, longest);
  if (!report.not_noticed.empty()) throw Failure(report.not_noticed);
  if (report.failed_socket == nullptr) return std::move(report.behind);
  const Daemon& daemon = report.failed_socket == kNotifydSocket ? kNotificationDaemon : kIndexDaemon;
  try {
    (void)DataOf(daemon, std::move(report.failure));
  } catch (const Refusal& refusal) {
    throw Failure(refusal.what());
  }
  return {};
}

/// Waits less than for other commands: it is asked before anything is changed, so that giving up costs nothing.
void RequireEngine() { (void)AskEngine(wire::EngineRequest("ping"), kStateWait); }

void RequireIndexDaemon() { (void)AskIndexDaemon("status", Json::Value()); }

void RequireDaemons() {
  RequireEngine();
  RequireIndexDaemon();
}

Json::Value ShareName(const std::string& name) {
  Json::Value data;
  data["share_name"] = name;
  return data;
}

Json::Value ShareIn(const Json::Value& status, const std::string& share) {
  if (!status.isObject()) return Json::Value();
  for (const Json::Value& entry : status["shares"]) {
    if (TextOf(entry, "share") == share) return entry;
  }
  return Json::Value();
}

void NotifySettingChanged(const std::string& share) {
  Json::Value data = ShareName(share);
  data["is_upsert"] = true;
  (void)AskIndexDaemonIfRunning("notify_setting_changed", data);
}

}  // namespace ferrox::cli
