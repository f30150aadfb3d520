#include "cli/why_not_indexed.h"

#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>
#include <cstring>
#include <memory>

#include <json/value.h>

#include "base/path.h"
#include "cli/ask.h"
#include "cli/command.h"
#include "cli/configuration_change.h"
#include "cli/excluded.h"
#include "cli/format.h"
#include "cli/kinds.h"
#include "cli/share_place.h"
#include "common/error.h"
#include "common/file_util.h"
#include "fileindex/folders/folder_mgr.h"
#include "fileindex/optree/optree.h"
#include "fileindex/queue/queue_file.h"
#include "fileindex/status_mgr.h"
#include "fileindex/util.h"
#include "sdk/share.h"

namespace ferrox::cli {

namespace {

std::string LinkTarget(const std::string& path) {
  char target[4096];
  const ssize_t length = readlink(path.c_str(), target, sizeof(target));
  return length < 0 ? "" : std::string(target, static_cast<size_t>(length));
}

/// What no configuration would change. `is_folder` is set when it is one.
std::string WhyNotByItself(const std::string& path, bool& is_folder) {
  struct stat status = {};
  if (lstat(path.c_str(), &status) != 0) {
    if (errno == ENOENT || errno == ENOTDIR) return "there is no such file; check the name";
    return "it cannot be looked at: " + std::string(strerror(errno));
  }
  is_folder = S_ISDIR(status.st_mode);
  if (S_ISLNK(status.st_mode)) {
    return "it is a link to " + LinkTarget(path) + "; links are not indexed, only the files themselves";
  }
  const std::string real = RealPath(path);
  if (!real.empty() && real != path) return "its path leads through a link; the file itself is " + real;
  return WhyNameLeftOut(Basename(path));
}

/// What the settings say of a file that could be indexed.
std::string WhyNotBySettings(const std::string& path, const std::string& share, const std::string& root,
                             bool is_folder) {
  const std::string left_out = WhyFolderLeftOut(root, is_folder ? path : Dirname(path));
  if (!left_out.empty()) return left_out;
  const fileindex::FolderMgr configured;
  if (!configured.IsFullPathIndexed(path)) {
    const std::string folder = is_folder ? path : Dirname(path);
    return "it lies in no indexed folder; 'fileindexctl folder add " + folder + "' indexes its folder";
  }
  const std::string excluded = ExclusionText(WhyExcluded(share, path), path);
  if (!excluded.empty()) return excluded;
  return IsPaused(share) ? "share " + share + " is paused; 'fileindexctl share resume " + share + "' resumes it" : "";
}

/// The daemon reads as the owner of the instance, so that only what is closed to this user, too, is closed to it.
std::string WhyNotByRights(const std::string& path) {
  struct stat status = {};
  const bool is_folder = lstat(path.c_str(), &status) == 0 && S_ISDIR(status.st_mode);
  if (faccessat(AT_FDCWD, path.c_str(), is_folder ? R_OK | X_OK : R_OK, AT_EACCESS) == 0) return "";
  return "it cannot be read: " + std::string(strerror(errno)) + "; give the service the right to read it";
}

/// Whether the operations of a queue, live or detached, concern the path. A queue that cannot be read tells nothing.
bool IsInQueue(const std::string& queue, const std::string& path) try {
  if (!IsFileExist(queue)) return false;
  bool found = false;
  fileindex::OPTree tree(queue);
  (void)tree.ProcessOP([&](const std::shared_ptr<fileindex::OP>& op) {
    const bool is_all = op->op == fileindex::OP_FULL_REINDEX;
    const bool is_it = op->op != fileindex::OP_DELETE && base::IsAtOrBelow(path, op->node->GetPath());
    found = found || is_all || is_it;
  });
  return found;
} catch (const Error&) {
  return false;
}

/// The reason under which the daemon has the file among its failures.
std::string FailureOf(const std::string& path, const Json::Value& status) {
  const Json::Value& failures = status["failures"];
  if (!failures.isObject()) return "";
  for (const std::string& reason : failures.getMemberNames()) {
    for (const Json::Value& example : failures[reason]["examples"]) {
      if (example.isString() && example.asString() == path) return reason;
    }
  }
  return "";
}

/// What the index daemon, which has yet to index it, is doing. "" when it has nothing to do.
std::string WhyNotYet(const std::string& path, const std::string& share) try {
  const Json::Value daemon = AskIndexDaemonIfRunning("status", Json::Value());
  if (daemon.isNull()) return "the index daemon does not run; start it with 'fileindexctl up'";
  const Json::Value status = ShareIn(daemon, share);
  const std::string failure = FailureOf(path, status);
  if (!failure.empty()) return "indexing it failed: " + failure + "; it is tried again when the file changes";
  const std::string queue = sdk::SDKShare(share).GetQueuePath();
  const std::string paused =
      daemon["paused"].asBool() ? "; indexing is paused, and 'fileindexctl resume' resumes it" : "";
  if (IsInQueue(queue, path) || IsInQueue(fileindex::DetachedQueuePath(queue), path)) {
    return "not yet: it waits in the queue, which has " + Count(UintOf(status, "queued")) + " changes" + paused;
  }
  const std::string state = TextOf(status, "state");
  const std::string detail = TextOf(status, "detail");
  if (state == "idle" && paused.empty()) return "";
  return "not yet: the index daemon says of its share: " + (state.empty() ? "nothing" : state) +
         (detail.empty() ? "" : ", " + detail) + paused;
} catch (const Failure& failure) {
  return failure.what();
}

}  // namespace

std::string WhyNotIndexed(const std::string& path, const std::string& share) {
  const std::string root = sdk::SDKShare(share).GetPath();
  bool is_folder = false;
  std::string why = WhyNotByItself(path, is_folder);
  if (why.empty()) why = WhyNotBySettings(path, share, root, is_folder);
  if (why.empty()) why = WhyNotByRights(path);
  if (why.empty()) why = WhyNotYet(path, share);
  if (!why.empty()) return why;
  return "nothing speaks against it: its change was not noticed; 'fileindexctl index " + share + "' finds it";
}

std::string WhyNameOnly(const std::string& path) {
  const std::string kind = KindNameOf(path);
  const fileindex::FolderMgr configured;
  const auto folder = configured.GetMostSuitableCfg(path);
  if (folder == nullptr) return "";
  const std::string excluded = ExclusionText(WhyExcluded(folder->GetShare(), path), path);
  if (!excluded.empty() || kind.empty()) return excluded;
  return "the content of " + kind + " files is not indexed in " + folder->GetPath() +
         "; 'fileindexctl folder set' changes that";
}

}  // namespace ferrox::cli
