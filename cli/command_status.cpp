#include <cstdio>
#include <map>

#include "cli/ask.h"
#include "cli/command_table.h"
#include "cli/escape.h"
#include "cli/explain.h"
#include "cli/format.h"
#include "cli/progress.h"
#include "cli/watching.h"
#include "common/clock.h"
#include "common/file_util.h"
#include "fileindex/folders/folder_mgr.h"
#include "platform/host/child_service.h"
#include "platform/host/share_table.h"

namespace ferrox::cli {

namespace {

void PrintReasons(const char* title, const Json::Value& counts, const Json::Value& examples) {
  for (const auto& reason : counts.getMemberNames()) {
    (void)printf("    %s: %s %s\n", title, Count(UintOf(counts, reason.c_str())).c_str(),
                 EscapeForTerminal(reason).c_str());
    if (!examples.isObject() || !examples[reason].isArray()) continue;
    for (const Json::Value& path : examples[reason]) {
      if (path.isString()) (void)printf("      %s\n", EscapeForTerminal(path.asString()).c_str());
    }
  }
}

/// Files of which a part was read are no failures.
void PrintExtractErrors(const Json::Value& counts, const Json::Value& examples) {
  const std::string prefix = kPartlyRead;
  Json::Value failed(Json::objectValue), partly(Json::objectValue), partly_examples(Json::objectValue);
  for (const std::string& reason : counts.getMemberNames()) {
    if (!StringStartWith(reason, prefix)) {
      failed[reason] = counts[reason];
      continue;
    }
    const std::string missing = reason.substr(prefix.size());
    partly[missing] = counts[reason];
    if (examples.isObject()) partly_examples[missing] = examples[reason];
  }
  PrintReasons("not read, or not all", failed, examples);
  PrintReasons("partly read", partly, partly_examples);
}

std::string FoldersText(uint64_t folders) { return Count(folders) + (folders == 1 ? " folder" : " folders"); }

void PrintWork(const Json::Value& share) {
  (void)printf("    %s", EscapeForTerminal(Progress::Text(share, 0)).c_str());
  if (share.isMember("folders")) (void)printf("; %s", FoldersText(UintOf(share, "folders")).c_str());
  (void)printf("\n    done since the daemon started: %s indexed, %s removed", Count(UintOf(share, "written")).c_str(),
               Count(UintOf(share, "deleted")).c_str());
  if (share["rate"].isNumeric() && share["rate"].asDouble() >= 0.5) {
    (void)printf(", now %s a second", Count(static_cast<uint64_t>(share["rate"].asDouble() + 0.5)).c_str());
  }
  if (UintOf(share, "failed") != 0) (void)printf(", %s failed", Count(UintOf(share, "failed")).c_str());
  (void)printf("\n");
}

void PrintShare(const Json::Value& share, const std::string& notification_problem) {
  const std::string name = EscapeForTerminal(TextOf(share, "share"));
  (void)printf("share %s: %s\n", name.c_str(), EscapeForTerminal(TextOf(share, "path")).c_str());
  PrintWork(share);
  (void)fputs(WatchLines(share, notification_problem).c_str(), stdout);
  const Json::Value& index = share["index"];
  if (index.isObject() && index.isMember("error")) {
    (void)printf("    index: cannot be searched: %s\n", EscapeOneLine(TextOf(index["error"], "msg")).c_str());
  } else if (index.isObject()) {
    (void)printf("    index: %s documents, %s, %s\n", Count(UintOf(index, "documents")).c_str(),
                 Size(IntOf(index, "bytes_on_disk")).c_str(),
                 IntOf(share, "last_commit") == 0 ? "no change since the daemon started"
                                                  : ("last change " + Date(IntOf(share, "last_commit"))).c_str());
  }
  if (index.isObject() && index["rebuilding"].isObject()) {
    (void)printf("    being rebuilt since %s, because %s; searches find what is indexed by now\n",
                 Date(IntOf(index["rebuilding"], "since")).c_str(),
                 EscapeOneLine(TextOf(index["rebuilding"], "reason")).c_str());
  }
  const int64_t oldest = IntOf(share, "oldest_change");
  const int64_t age = oldest == 0 ? 0 : Clock::Get().Now() - oldest;
  (void)printf("    queued: %s%s\n", Count(UintOf(share, "queued")).c_str(),
               oldest == 0 ? "" : (", the oldest for " + Duration(static_cast<double>(age))).c_str());
  if (index.isObject() && index["extract_errors"].isObject()) {
    PrintExtractErrors(index["extract_errors"], index["extract_error_examples"]);
    if (!index["extract_errors"].empty()) (void)printf("      all: fileindexctl unread %s\n", name.c_str());
  }
  for (const Json::Value& folder : share["left_out"]) {
    (void)printf("    left out: %s: %s\n", EscapeForTerminal(TextOf(folder, "path")).c_str(),
                 EscapeForTerminal(TextOf(folder, "reason")).c_str());
  }
  Json::Value counts(Json::objectValue);
  Json::Value examples(Json::objectValue);
  for (const auto& reason : share["failures"].getMemberNames()) {
    counts[reason] = share["failures"][reason]["count"];
    examples[reason] = share["failures"][reason]["examples"];
  }
  PrintReasons("not indexed", counts, examples);
}

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

std::string EngineText(const Json::Value& engine) {
  return engine.isNull() ? kStopped : "runs, process " + std::to_string(IntOf(engine, "pid"));
}

/// `text` of its status, or why there is none.
void PrintDaemon(const char* name, const DaemonState& daemon, const std::string& text) {
  (void)printf("%s: %s\n", name, daemon.problem.empty() ? text.c_str() : EscapeForTerminal(daemon.problem).c_str());
}

Json::Value StatusJson(const DaemonState& daemon) {
  if (daemon.problem.empty()) return daemon.status;
  Json::Value json;
  json["problem"] = daemon.problem;
  return json;
}

std::string DaemonText(const Json::Value& daemon, bool needed) {
  if (daemon.isNull()) return needed ? kStopped : "does not run; it starts with the first indexed folder";
  return "runs, process " + std::to_string(IntOf(daemon, "pid")) + ", " + std::to_string(UintOf(daemon, "workers")) +
         " workers" + PauseText(daemon);
}

/// What of the workers' sandbox the kernel lacks is worth knowing.
std::string ContentExtractionText(const Json::Value& daemon) {
  if (!daemon.isObject()) return "does not run; it starts with the first file whose content is wanted";
  std::string text = "runs, process " + std::to_string(IntOf(daemon, "pid")) + ", " + Count(UintOf(daemon, "workers")) +
                     " of at most " + Count(UintOf(daemon, "workers_max")) + " workers, " +
                     Count(UintOf(daemon, "files")) + " files read";
  const uint64_t blamed = UintOf(daemon, "blamed");
  if (blamed != 0) text += ", of which " + Count(blamed) + " broke a worker";
  for (const Json::Value& piece : daemon["missing"]) {
    if (piece.isString())
      text += "\n    the workers lack a protection on this system: " + EscapeForTerminal(piece.asString());
  }
  for (const Json::Value& root : daemon["unresponsive"]) {
    if (root.isString()) text += "\n    its file system does not answer: " + EscapeForTerminal(root.asString());
  }
  for (const Json::Value& program : daemon["not_installed"]) {
    if (program.isString())
      text += "\n    not installed: " + EscapeForTerminal(program.asString()) + "; what it reads is found by name only";
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

void PrintSupervisor() {
  const Json::Value supervisor = SupervisorJson();
  if (TextOf(supervisor, "program") == "systemd") return;
  const std::string text = supervisor.isNull()
                               ? "does not run: a daemon that is killed stays down; start it with 'fileindexctl up'"
                               : "runs, process " + std::to_string(IntOf(supervisor, "pid"));
  (void)printf("supervisor: %s\n", text.c_str());
}

/// `needed`: folders are indexed, which takes more than the engine. Content extraction starts by itself.
int ExitCodeOf(const InstanceState& state, bool needed) {
  const bool stopped = needed && (state.index_daemon.status.isNull() || state.notification_daemon.status.isNull());
  if (stopped || state.engine.status.isNull()) return kFailure;
  for (const DaemonState* daemon :
       {&state.engine, &state.index_daemon, &state.notification_daemon, &state.content_extraction}) {
    if (!daemon->problem.empty()) return kFailure;
  }
  return kDone;
}

}  // namespace

int RunStatus(const Arguments& arguments) {
  InstanceState state = AskAll();
  Json::Value& daemon = state.index_daemon.status;
  const Json::Value& notification_daemon = state.notification_daemon.status;
  AddWatches(notification_daemon, daemon);
  std::string problem;
  const Json::Value resting = RestingShares(daemon, problem);
  const std::string table_problem = kova::host::ShareTable::Load(kova::host::ShareTablePath()).Problem();
  const bool has_shares = !daemon.isNull() && !daemon["shares"].empty();
  const bool needed = has_shares || !resting.empty();
  const int code = problem.empty() && table_problem.empty() ? ExitCodeOf(state, needed) : kFailure;
  if (arguments.Has("--json")) {
    Json::Value json;
    json["engine"] = StatusJson(state.engine);
    json["index_daemon"] = StatusJson(state.index_daemon);
    json["notification_daemon"] = StatusJson(state.notification_daemon);
    json["content_extraction"] = StatusJson(state.content_extraction);
    json["supervisor"] = SupervisorJson();
    json["resting_shares"] = resting;
    if (!problem.empty() || !table_problem.empty()) json["problem"] = problem.empty() ? table_problem : problem;
    (void)printf("%s\n", ToScriptJson(json).c_str());
    return code;
  }
  PrintDaemon("search engine", state.engine, EngineText(state.engine.status));
  PrintDaemon("index daemon", state.index_daemon, DaemonText(daemon, needed || !problem.empty()));
  PrintDaemon("notification daemon", state.notification_daemon,
              NotificationDaemonText(notification_daemon, needed || !problem.empty()));
  PrintDaemon("content extraction", state.content_extraction, ContentExtractionText(state.content_extraction.status));
  PrintSupervisor();
  if (!problem.empty()) (void)printf("indexed folders: %s\n", EscapeForTerminal(problem).c_str());
  if (!daemon.isNull()) {
    const bool hangs = !state.notification_daemon.problem.empty();
    const char* problem_of_watching = hangs ? "does not answer" : notification_daemon.isNull() ? "does not run" : "";
    for (const Json::Value& share : daemon["shares"]) PrintShare(share, problem_of_watching);
  }
  for (const Json::Value& share : resting) {
    (void)printf("share %s: %s; %s\n", EscapeForTerminal(TextOf(share, "share")).c_str(),
                 FoldersText(UintOf(share, "folders")).c_str(),
                 share["paused"].asBool()             ? "paused until 'fileindexctl share resume'"
                 : state.index_daemon.problem.empty() ? "nothing works on it now"
                                                      : "what is done with it is not known");
  }
  return code;
}

}  // namespace ferrox::cli
