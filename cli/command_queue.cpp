#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>
#include <cstdio>
#include <fstream>
#include <sstream>

#include "cli/command_table.h"
#include "cli/escape.h"
#include "cli/output.h"
#include "cli/rights.h"
#include "common/json_util.h"
#include "fileindex/optree/optree.h"

/// A look into a queue file: which operations wait in it, when a change does not appear in the index.
namespace ferrox::cli {

namespace {

/// Behind whatever is wrong with the path.
constexpr char kRemedy[] = "; give the path of a share's queue file";

using OpPtr = std::shared_ptr<fileindex::OP>;

/// The reader of queues takes a missing file for an empty queue; here a path that was mistyped must not pass for one.
void CheckReadable(const std::string& path) {
  struct stat status = {};
  const bool there = stat(path.c_str(), &status) == 0;
  if (!there) ThrowSystemFailure(errno, "read", path, kRemedy);
  if (!S_ISREG(status.st_mode)) throw Failure(path + " is not a file" + kRemedy);
  if (faccessat(AT_FDCWD, path.c_str(), R_OK, AT_EACCESS) != 0) ThrowSystemFailure(errno, "read", path);
}

/// A file of anything else would pass for a queue in which nothing is queued.
void RequireQueue(const std::string& path) {
  constexpr size_t kLookedAtBytes = 1 << 20;
  std::string beginning(kLookedAtBytes, '\0');
  std::ifstream file(path);
  (void)file.read(beginning.data(), static_cast<std::streamsize>(beginning.size()));
  beginning.resize(static_cast<size_t>(file.gcount()));
  for (const std::string& line : Split(beginning, '\n')) {
    Json::Value event;
    if (fromString(event, line) && event.isObject() && event.isMember("event")) return;
  }
  if (!beginning.empty()) throw Failure(path + " is no queue file: no line at its beginning is an event" + kRemedy);
}

/// The text that the library logs.
void PrintOpAsText(const OpPtr& op) {
  std::ostringstream text;
  text << op;
  (void)printf("%s\n", EscapeForTerminal(text.str()).c_str());
}

/// The members stand in this order, so that the lines can also be read by eye.
void PrintOpAsJson(const OpPtr& op) {
  (void)printf("{\"op\":%d,\"node\":%s,\"path\":%s,\"data\":%s}\n", static_cast<int>(op->op),
               ToScriptJson(op->node->GetPath()).c_str(), ToScriptJson(op->path).c_str(),
               ToScriptJson(op->data).c_str());
}

}  // namespace

/// Reads a queue, live or detached, as the index daemon would, and prints the operations that its lines come to.
/// Nothing is changed, and no instance is needed. The count goes to standard error, behind all operations.
int RunQueueShow(const Arguments& arguments) {
  const std::string& path = arguments.words[0];
  CheckReadable(path);
  RequireQueue(path);
  fileindex::OPTree tree(path);
  const int count = tree.ProcessOP(arguments.Has("--json") ? &PrintOpAsJson : &PrintOpAsText);
  FlushOutput();
  (void)fprintf(stderr, "%d\n", count);
  return kDone;
}

}  // namespace ferrox::cli
