#include <climits>
#include <cstdio>
#include <cstdlib>

#include "cli/ask.h"
#include "cli/command.h"
#include "cli/escape.h"
#include "common/error.h"
#include "common/file_util.h"
#include "fileindex/elastic/elastic_control.h"
#include "fileindex/optree.h"
#include "fileindex/util.h"
#include "platform/host/share_table.h"
#include "sdk/share.h"

namespace ferrox::cli {

namespace {

Json::Value ShareName(const std::string& name) {
  Json::Value data;
  data["share_name"] = name;
  return data;
}

/// The folder without links, "." and "..", which is what a share's folder must be.
std::string RealFolder(const std::string& folder) {
  const std::string real = RealPath(folder);
  if (real.empty()) throw Failure(EscapeForTerminal(folder) + ": no such folder; make it first");
  if (!IsDirExist(real, false)) throw Failure(EscapeForTerminal(folder) + " is no folder; a share must be one");
  return real;
}

std::vector<kova::host::ShareEntry> Shares() {
  try {
    return kova::host::ListShares();
  } catch (const kova::host::ShareTableError& error) {
    throw Failure(error.what());
  }
}

/// The worker goes first, since it would make a dropped index anew. The queue is dropped with the share: it would be
/// taken for that of a later share of the same folder.
void RemoveShare(const std::string& name) {
  std::string queue_path;
  try {
    queue_path = sdk::SDKShare(name).GetQueuePath();
  } catch (const Error& error) {
    if (error.Code() != Error::kNoSuchShare) throw;
    throw Failure("there is no share \"" + EscapeForTerminal(name) + "\"; 'fileindexctl share list' shows them");
  }
  (void)AskEngine("ping", Json::Value(Json::objectValue));
  (void)AskIndexDaemonIfRunning("worker_delete", ShareName(name));
  try {
    fileindex::elastic::ShareIndexDelete(name);
  } catch (const Error& error) {
    if (error.Code() != Error::kEngineNoSuchIndex) throw;
  }
  try {
    kova::host::RemoveShare(name);
  } catch (const kova::host::ShareTableError& error) {
    throw Failure(error.what());
  }
  (void)Unlink(queue_path);
  (void)Unlink(queue_path + ".tmp");
  (void)printf("share %s and its index are gone; its folder is as it was\n", EscapeForTerminal(name).c_str());
}

}  // namespace

int RunShareAdd(const Arguments& arguments) {
  kova::host::ShareEntry entry;
  entry.path = RealFolder(arguments.words[0]);
  entry.name = arguments.Get("--name", Basename(entry.path));
  for (const auto& known : Shares()) {
    if (known.name != entry.name) continue;
    if (known.path == entry.path) {
      (void)printf("%s is a share already\n", EscapeForTerminal(entry.path).c_str());
      return kDone;
    }
    if (arguments.Has("--replace")) RemoveShare(known.name);
  }
  try {
    kova::host::AddShare(entry);
  } catch (const kova::host::ShareTableError& error) {
    throw Failure(error.what());
  }
  fileindex::AddCustomEvent(fileindex::EVENT_REINDEX, entry.path, "", Json::Value());
  const bool told = !AskIndexDaemonIfRunning("status", Json::Value()).isNull();
  if (told) (void)AskIndexDaemon("worker_create", ShareName(entry.name));
  (void)printf("share %s: %s%s\n", EscapeForTerminal(entry.name).c_str(), EscapeForTerminal(entry.path).c_str(),
               told ? "" : " (it will be indexed when the daemons run: 'fileindexctl up')");
  return kDone;
}

int RunShareList(const Arguments& arguments) {
  const auto shares = Shares();
  Json::Value list(Json::arrayValue);
  for (const auto& share : shares) {
    Json::Value entry;
    entry["name"] = share.name;
    entry["path"] = share.path;
    list.append(entry);
    if (!arguments.Has("--json")) {
      (void)printf("%-20s %s\n", EscapeForTerminal(share.name).c_str(), EscapeForTerminal(share.path).c_str());
    }
  }
  if (arguments.Has("--json")) (void)printf("%s\n", ToScriptJson(list).c_str());
  if (shares.empty() && !arguments.Has("--json")) {
    (void)fprintf(stderr, "there are no shares; add one with 'fileindexctl share add FOLDER'\n");
  }
  return shares.empty() ? kNothingFound : kDone;
}

int RunShareRemove(const Arguments& arguments) {
  RemoveShare(arguments.words[0]);
  return kDone;
}

}  // namespace ferrox::cli
