#include <cstdio>

#include "cli/ask.h"
#include "cli/command.h"
#include "cli/escape.h"
#include "cli/format.h"
#include "cli/progress.h"
#include "common/clock.h"

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

void PrintShare(const Json::Value& share) {
  (void)printf("share %s: %s\n", EscapeForTerminal(TextOf(share, "share")).c_str(),
               EscapeForTerminal(TextOf(share, "path")).c_str());
  (void)printf("    %s\n", EscapeForTerminal(Progress::Text(share, 0)).c_str());
  const Json::Value& index = share["index"];
  if (index.isObject()) {
    (void)printf("    index: %s documents, %s, %s\n", Count(UintOf(index, "documents")).c_str(),
                 Size(IntOf(index, "bytes_on_disk")).c_str(),
                 IntOf(share, "last_commit") == 0 ? "no change since the daemon started"
                                                  : ("last change " + Date(IntOf(share, "last_commit"))).c_str());
  }
  const int64_t oldest = IntOf(share, "oldest_change");
  const int64_t age = oldest == 0 ? 0 : Clock::Get().Now() - oldest;
  (void)printf("    queued: %s%s\n", Count(UintOf(share, "queued")).c_str(),
               oldest == 0 ? "" : (", the oldest for " + Duration(static_cast<double>(age))).c_str());
  if (index.isObject() && index["extract_errors"].isObject()) {
    PrintReasons("indexed by name only", index["extract_errors"], index["extract_error_examples"]);
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

/// The engine's "ping" reply, or null when it does not run.
Json::Value EngineState() {
  try {
    return AskEngine("ping", Json::Value(Json::objectValue));
  } catch (const Failure&) {
    return Json::Value();
  }
}

}  // namespace

int RunStatus(const Arguments& arguments) {
  const Json::Value engine = EngineState();
  const Json::Value daemon = AskIndexDaemonIfRunning("status", Json::Value());
  if (arguments.Has("--json")) {
    Json::Value json;
    json["engine"] = engine;
    json["index_daemon"] = daemon;
    (void)printf("%s\n", ToScriptJson(json).c_str());
    return kDone;
  }
  const char* stopped = "does not run; start it with 'fileindexctl up'";
  (void)printf("search engine: %s\n",
               engine.isNull() ? stopped : ("runs, process " + std::to_string(IntOf(engine, "pid"))).c_str());
  (void)printf("index daemon: %s\n", daemon.isNull()
                                         ? stopped
                                         : ("runs, process " + std::to_string(IntOf(daemon, "pid")) + ", " +
                                            std::to_string(UintOf(daemon, "workers")) + " workers" + PauseText(daemon))
                                               .c_str());
  if (!daemon.isNull()) {
    for (const Json::Value& share : daemon["shares"]) PrintShare(share);
  }
  return kDone;
}

}  // namespace ferrox::cli
