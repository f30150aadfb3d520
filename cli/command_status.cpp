#include <cstdio>
#include <map>
#include <memory>
#include <string>

#include "cli/ask.h"
#include "cli/command_table.h"
#include "cli/configuration_change.h"
#include "cli/escape.h"
#include "cli/explain.h"
#include "cli/format.h"
#include "cli/output.h"
#include "cli/share_report.h"
#include "cli/watching.h"
#include "common/json_util.h"
#include "fileindex/folders/folder_mgr.h"
#include "platform/host/child_service.h"
#include "platform/host/share_table.h"
#include "platform/host/synonyms.h"
#include "services/support/instance_owner.h"

/// The state of the whole instance: the daemons, the supervisor, and each share with indexed folders. Nothing here
/// changes anything, and nothing that is broken hides the rest: each part is asked for by itself, and what is wrong
/// with one takes the place of its state.
namespace ferrox::cli {

namespace {

/// Of everything; a share that is paused says so in its own line.
std::string PauseText(const Json::Value& status) {
  if (!status["paused"].asBool()) return "";
  const int64_t until = IntOf(status, "resume_time");
  return until == 0 ? ", paused until 'fileindexctl resume'" : ", paused until " + Date(until);
}

/// The shares with indexed folders that nothing works on: {"share", "folders", "paused"} each. Where the list of
/// folders cannot be read, that is a `problem`: the rest is worth showing all the more.
Json::Value RestingShares(const Json::Value& daemon, std::string& problem) try {
  std::map<std::string, Json::Value> shares;
  const fileindex::FolderMgr configured;
  for (const auto& folder : configured.GetFolders()) {
    Json::Value& share = shares[folder->GetShare()];
    share["share"] = folder->GetShare();
    share["folders"] = Json::UInt64(UintOf(share, "folders") + 1);
    share["paused"] = folder->IsPaused() || share["paused"].asBool();
  }
  if (!daemon.isNull()) {
    for (const Json::Value& busy : daemon["shares"]) shares.erase(TextOf(busy, "share"));
  }
  Json::Value list(Json::arrayValue);
  for (const auto& [name, share] : shares) list.append(share);
  return list;
} catch (const Error& error) {
  problem = Explain(error);
  return Json::Value(Json::arrayValue);
}

constexpr char kStopped[] = "does not run; start it with 'fileindexctl up'";

/// Without the engine nothing works, so that it is always said how to start it.
std::string EngineText(const Json::Value& engine) {
  return engine.isNull() ? kStopped : "runs, process " + std::to_string(IntOf(engine, "pid"));
}

/// `text` of its status, or why there is none.
void PrintDaemon(const char* name, const DaemonState& daemon, const std::string& text) {
  (void)printf("%s: %s\n", name, daemon.problem.empty() ? text.c_str() : EscapeForTerminal(daemon.problem).c_str());
}

/// The daemon's own reply, unchanged, null when it does not run, or {"problem"}.
Json::Value StatusJson(const DaemonState& daemon) {
  if (daemon.problem.empty()) return daemon.status;
  Json::Value json;
  json["problem"] = daemon.problem;
  return json;
}

/// `needed`: there are indexed folders. Without them the daemon is rightly away.
std::string DaemonText(const Json::Value& daemon, bool needed) {
  if (daemon.isNull()) return needed ? kStopped : "does not run; it starts with the first indexed folder";
  return "runs, process " + std::to_string(IntOf(daemon, "pid")) + ", " + std::to_string(UintOf(daemon, "workers")) +
         " workers" + PauseText(daemon);
}

/// Folders of shares whose file system does not answer, each in a line of its own.
std::string UnresponsiveText(const Json::Value& daemon) {
  std::string text;
  for (const Json::Value& root : daemon["unresponsive"]) {
    if (root.isString()) text += "\n    its file system does not answer: " + EscapeForTerminal(root.asString());
  }
  return text;
}

/// What of the workers' sandbox the kernel lacks is worth knowing.
std::string ContentExtractionText(const Json::Value& daemon) {
  if (!daemon.isObject()) return "does not run; it starts with the first file whose content is wanted";
  std::string text = "runs, process " + std::to_string(IntOf(daemon, "pid")) + ", " + Count(UintOf(daemon, "workers")) +
                     " of at most " + Count(UintOf(daemon, "workers_max")) + " workers, " +
                     Count(UintOf(daemon, "files")) + " files read";
  const uint64_t blamed = UintOf(daemon, "blamed");
  if (blamed != 0) text += ", of which " + Count(blamed) + " crashed a worker";
  for (const Json::Value& piece : daemon["missing"]) {
    if (piece.isString())
      text += "\n    the workers lack a protection on this system: " + EscapeForTerminal(piece.asString());
  }
  text += UnresponsiveText(daemon);
  for (const Json::Value& program : daemon["not_installed"]) {
    if (program.isString())
      text += "\n    not installed: " + EscapeForTerminal(program.asString()) +
              "; files that it would read are found by name only";
  }
  return text;
}

/// Only an instance of root's has users whose access is checked.
std::string AccessCheckText(const Json::Value& daemon) {
  if (!daemon.isObject()) return std::string(kStopped) + "; until then only root finds anything";
  return "runs, process " + std::to_string(IntOf(daemon, "pid")) + UnresponsiveText(daemon);
}

std::string WebText(const Json::Value& daemon) {
  if (!daemon.isObject()) return kStopped;
  std::string text = "runs, process " + std::to_string(IntOf(daemon, "pid"));
  for (const Json::Value& address : daemon["addresses"]) {
    if (address.isString()) text += ", " + EscapeForTerminal(address.asString());
  }
  return text;
}

/// Null where there is none, and systemd does its work.
Json::Value SupervisorJson() {
  Json::Value json;
  const pid_t pid = kova::host::ChildServicePid(kova::host::kSupervisor);
  if (kova::host::HasServiceManager()) json["program"] = "systemd";
  if (!kova::host::HasServiceManager() && pid != 0) {
    json["program"] = kova::host::kSupervisor.program;
    json["pid"] = pid;
  }
  return json;
}

/// Says nothing on a host whose service manager does that work.
void PrintSupervisor() {
  const Json::Value supervisor = SupervisorJson();
  if (TextOf(supervisor, "program") == "systemd") return;
  const std::string text = supervisor.isNull()
                               ? "does not run: a daemon that is killed stays down; start it with 'fileindexctl up'"
                               : "runs, process " + std::to_string(IntOf(supervisor, "pid"));
  (void)printf("supervisor: %s\n", text.c_str());
}

/// Everything that 'status' shows, gathered before any of it is printed.
struct Report {
  InstanceState state;
  Json::Value resting;          ///< shares with indexed folders that no worker has (RestingShares)
  std::string folders_problem;  ///< why the list of indexed folders cannot be read, "" when it can
  std::string table_problem;    ///< the same of the table of shares
  std::shared_ptr<const kova::host::SynonymList> synonyms = kova::host::GetSynonyms();
  bool has_folders = false;  ///< folders are indexed, which takes more than the engine

  const Json::Value& IndexDaemon() const { return state.index_daemon.status; }
  const Json::Value& NotificationDaemon() const { return state.notification_daemon.status; }
};

/// Asks the daemons first: a share that gets a worker after that is still shown, as one that rests.
Report Gather() {
  Report report;
  report.state = AskAll();
  AddWatches(report.NotificationDaemon(), report.state.index_daemon.status);
  report.resting = RestingShares(report.IndexDaemon(), report.folders_problem);
  report.table_problem = kova::host::ShareTable::Load(kova::host::ShareTablePath()).Problem();
  const bool has_workers = !report.IndexDaemon().isNull() && !report.IndexDaemon()["shares"].empty();
  report.has_folders = has_workers || !report.resting.empty();
  return report;
}

/// Content extraction starts by itself when it is needed, so that it may be stopped.
int ExitCodeOf(const Report& report) {
  if (!report.folders_problem.empty() || !report.table_problem.empty()) return kFailure;
  const bool is_unchecked = services::IsRootsInstance() && report.state.access_check.status.isNull();
  const bool is_stopped =
      report.has_folders && (report.IndexDaemon().isNull() || report.NotificationDaemon().isNull() || is_unchecked);
  if (is_stopped || report.state.engine.status.isNull()) return kFailure;
  for (const DaemonState* daemon : {&report.state.engine, &report.state.index_daemon, &report.state.notification_daemon,
                                    &report.state.content_extraction, &report.state.access_check, &report.state.web}) {
    if (!daemon->problem.empty()) return kFailure;
  }
  return kDone;
}

/// The members are what scripts go by; each is there always, null or empty where there is nothing, but for "problem".
void PrintAsJson(const Report& report) {
  Json::Value json;
  json["engine"] = StatusJson(report.state.engine);
  json["index_daemon"] = StatusJson(report.state.index_daemon);
  json["notification_daemon"] = StatusJson(report.state.notification_daemon);
  json["content_extraction"] = StatusJson(report.state.content_extraction);
  json["access_check"] = StatusJson(report.state.access_check);
  json["web"] = StatusJson(report.state.web);
  json["supervisor"] = SupervisorJson();
  json["resting_shares"] = report.resting;
  json["synonym_problems"] = Vec2JsonArr(report.synonyms->problems);
  const std::string& problem = report.folders_problem.empty() ? report.table_problem : report.folders_problem;
  if (!problem.empty()) json["problem"] = problem;
  PrintJson(json);
}

/// A line for each, more where something is wrong with it.
void PrintDaemons(const Report& report) {
  // Where the list of folders cannot be read, some may be indexed.
  const bool needed = report.has_folders || !report.folders_problem.empty();
  PrintDaemon("search engine", report.state.engine, EngineText(report.state.engine.status));
  PrintDaemon("index daemon", report.state.index_daemon, DaemonText(report.IndexDaemon(), needed));
  PrintDaemon("notification daemon", report.state.notification_daemon,
              NotificationDaemonText(report.NotificationDaemon(), needed));
  PrintDaemon("content extraction", report.state.content_extraction,
              ContentExtractionText(report.state.content_extraction.status));
  if (services::IsRootsInstance()) {
    PrintDaemon("access check", report.state.access_check, AccessCheckText(report.state.access_check.status));
  }
  PrintDaemon("web daemon", report.state.web, WebText(report.state.web.status));
  PrintSupervisor();
}

/// Lines of the administrator's list that do not count; the others do, so this is no failure.
void PrintSynonymProblems(const Report& report) {
  for (const std::string& problem : report.synonyms->problems) {
    (void)printf("synonyms: %s: %s\n", kova::host::SynonymsPath().c_str(), EscapeForTerminal(problem).c_str());
  }
}

/// First those that a worker has, then those that none has.
void PrintShares(const Report& report) {
  if (!report.IndexDaemon().isNull()) {
    const bool hangs = !report.state.notification_daemon.problem.empty();
    const char* problem = hangs ? "does not answer" : report.NotificationDaemon().isNull() ? "does not run" : "";
    for (const Json::Value& share : report.IndexDaemon()["shares"]) PrintShare(share, problem);
  }
  for (const Json::Value& share : report.resting) {
    (void)printf("share %s: %s; %s\n", EscapeForTerminal(TextOf(share, "share")).c_str(),
                 FoldersText(UintOf(share, "folders")).c_str(),
                 share["paused"].asBool() ? "paused until 'fileindexctl share resume'"
                 : report.state.index_daemon.problem.empty()
                     ? "nothing works on it now; 'fileindexctl up' starts what is missing"
                     : "its state is not known, since the index daemon does not answer");
  }
}

/// Takes all other shares out of a list.
void KeepShare(Json::Value& list, const std::string& share) {
  Json::Value kept(Json::arrayValue);
  for (const Json::Value& entry : list) {
    if (TextOf(entry, "share") == share) kept.append(entry);
  }
  list.swap(kept);
}

/// The share as the index daemon has it, or as one that nothing works on. The daemons are shown where one is missing.
int ShowOneShare(Report report, const std::string& name, bool json) {
  const bool is_readable = report.folders_problem.empty() && report.table_problem.empty();
  const std::string share = is_readable ? IndexedShare(name) : name;
  const int code = ExitCodeOf(report);
  Json::Value& daemon = report.state.index_daemon.status;
  if (daemon.isObject()) KeepShare(daemon["shares"], share);
  KeepShare(report.resting, share);
  if (json) {
    const Json::Value entry = ShareIn(daemon, share);
    PrintJson(entry.isNull() ? report.resting[0] : entry);
    return code;
  }
  if (code != kDone) PrintDaemons(report);
  PrintShares(report);
  return code;
}

}  // namespace

/// The exit code says whether all that is needed runs, for scripts that do not read the rest.
int RunStatus(const Arguments& arguments) {
  const Report report = Gather();
  if (!arguments.words.empty()) return ShowOneShare(report, arguments.words[0], arguments.Has("--json"));
  if (arguments.Has("--json")) {
    PrintAsJson(report);
    return ExitCodeOf(report);
  }
  PrintDaemons(report);
  if (!report.folders_problem.empty()) {
    (void)printf("indexed folders: %s\n", EscapeForTerminal(report.folders_problem).c_str());
  }
  PrintSynonymProblems(report);
  PrintShares(report);
  return ExitCodeOf(report);
}

}  // namespace ferrox::cli
