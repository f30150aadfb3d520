#include "cli/share_report.h"

#include <cstdio>

#include "cli/escape.h"
#include "cli/format.h"
#include "cli/progress.h"
#include "cli/watching.h"
#include "common/clock.h"
#include "common/file_util.h"

namespace ferrox::cli {

namespace {

/// A line for each reason with its count, and below it the paths of some files.
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
  // One table from the engine holds both: the beginning of a stored reason says which it is (kPartlyRead).
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

/// What the worker does now, and what it has done since the daemon started.
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

/// How far the engine is with a newer format of the index's file, or why that waits.
void PrintUpgrading(const Json::Value& upgrading) {
  const std::string problem = TextOf(upgrading, "problem");
  if (!problem.empty()) {
    (void)printf("    not upgraded yet: %s; searches go on\n", EscapeOneLine(problem).c_str());
    return;
  }
  const uint64_t done = UintOf(upgrading, "done"), of = UintOf(upgrading, "of");
  (void)printf("    being upgraded: %d%%, %s of %s documents; searches go on, changes are indexed afterwards\n",
               of == 0 ? 0 : static_cast<int>(done * 100 / of), Count(done).c_str(), Count(of).c_str());
}

/// What the engine has of the share; nothing where it has none.
void PrintIndex(const Json::Value& share) {
  const Json::Value& index = share["index"];
  if (!index.isObject()) return;
  if (index.isMember("error")) {
    (void)printf("    index: cannot be searched: %s\n", EscapeOneLine(TextOf(index["error"], "msg")).c_str());
  } else {
    (void)printf("    index: %s documents, %s, %s\n", Count(UintOf(index, "documents")).c_str(),
                 Size(IntOf(index, "bytes_on_disk")).c_str(),
                 IntOf(share, "last_commit") == 0 ? "no change since the daemon started"
                                                  : ("last change " + Date(IntOf(share, "last_commit"))).c_str());
  }
  if (UintOf(index, "clearing") != 0) {
    (void)printf("    %s documents of deleted folders are still to be cleared from its file; no search finds them\n",
                 Count(UintOf(index, "clearing")).c_str());
  }
  if (index["rebuilding"].isObject()) {
    (void)printf("    being rebuilt since %s, because %s; searches find what is indexed by now\n",
                 Date(IntOf(index["rebuilding"], "since")).c_str(),
                 EscapeOneLine(TextOf(index["rebuilding"], "reason")).c_str());
  }
  if (index["upgrading"].isObject()) PrintUpgrading(index["upgrading"]);
}

/// How many changes wait, and how long the oldest has waited.
void PrintQueued(const Json::Value& share) {
  const int64_t oldest = IntOf(share, "oldest_change");
  const int64_t age = oldest == 0 ? 0 : Clock::Get().Now() - oldest;
  (void)printf("    queued: %s%s\n", Count(UintOf(share, "queued")).c_str(),
               oldest == 0 ? "" : (", the oldest for " + Duration(static_cast<double>(age))).c_str());
}

/// Files that were not read, folders that are no part of the index, and what could not be indexed at all.
void PrintMissing(const Json::Value& share) {
  const Json::Value& index = share["index"];
  if (index.isObject() && index["extract_errors"].isObject()) {
    PrintExtractErrors(index["extract_errors"], index["extract_error_examples"]);
    if (!index["extract_errors"].empty()) {
      (void)printf("      all: fileindexctl unread %s\n", EscapeForTerminal(TextOf(share, "share")).c_str());
    }
  }
  for (const Json::Value& folder : share["left_out"]) {
    (void)printf("    left out: %s: %s\n", EscapeForTerminal(TextOf(folder, "path")).c_str(),
                 EscapeForTerminal(TextOf(folder, "reason")).c_str());
  }
  for (const Json::Value& file : share["refused_patterns"]) {
    (void)printf("    not followed: %s: %s\n", EscapeForTerminal(TextOf(file, "path")).c_str(),
                 EscapeForTerminal(TextOf(file, "reason")).c_str());
  }
  Json::Value counts(Json::objectValue);
  Json::Value examples(Json::objectValue);
  for (const auto& reason : share["failures"].getMemberNames()) {
    counts[reason] = share["failures"][reason]["count"];
    examples[reason] = share["failures"][reason]["examples"];
  }
  PrintReasons("not indexed", counts, examples);
}

}  // namespace

std::string FoldersText(uint64_t folders) { return Count(folders) + (folders == 1 ? " folder" : " folders"); }

void PrintShare(const Json::Value& share, const std::string& notification_problem) {
  (void)printf("share %s: %s\n", EscapeForTerminal(TextOf(share, "share")).c_str(),
               EscapeForTerminal(TextOf(share, "path")).c_str());
  PrintWork(share);
  (void)fputs(WatchLines(share, notification_problem).c_str(), stdout);
  PrintIndex(share);
  const std::string refused = TextOf(share, "refused");
  if (!refused.empty()) (void)printf("    not searched by ordinary users: %s\n", EscapeForTerminal(refused).c_str());
  PrintQueued(share);
  PrintMissing(share);
}

}  // namespace ferrox::cli
