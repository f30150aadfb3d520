#include <getopt.h>
#include <malloc.h>

#include <cstdio>
#include <cstdlib>
#include <exception>
#include <optional>
#include <string>

#include <kova/log.h>

#include "common/error.h"
#include "common/paths.h"
#include "platform/host/exclusion_settings.h"
#include "platform/host/mounts.h"
#include "platform/host/samba_shares.h"
#include "platform/host/share_search.h"
#include "services/fileindexd/index_daemon.h"
#include "services/support/daemon.h"
#include "services/support/engine_user.h"

namespace {

constexpr char kUsage[] =
    "Usage: fileindexd [--workers N]\n"
    "Keeps the search index of each share in step with the share's queue of changes.\n"
    "  --workers N   threads that read files (default: one a processor, at least 2)\n"
    "  --help        this text\n"
    "  --version     the version\n"
    "The environment variable FERROX_ROOT chooses the instance.\n";

/// False when the arguments cannot be understood. `answer` is what is only to be printed.
bool ParseArguments(int argc, char** argv, ferrox::indexd::IndexDaemon::Options& options, const char*& answer) {
  const option known[] = {{"workers", required_argument, nullptr, 'w'},
                          {"help", no_argument, nullptr, 'h'},
                          {"version", no_argument, nullptr, 'v'},
                          {}};
  for (int letter = 0; (letter = getopt_long(argc, argv, "", known, nullptr)) != -1;) {
    if (letter == '?') return false;
    if (letter == 'h') answer = kUsage;
    if (letter == 'v') answer = "fileindexd " FERROX_VERSION "\n";
    if (letter == 'w') options.workers = static_cast<unsigned>(strtoul(optarg, nullptr, 10));
    if (letter == 'w' && (options.workers == 0 || options.workers > 256)) return false;
  }
  return optind == argc;
}

std::optional<ferrox::wire::IndexShare> DescribeShare(const std::string& share) {
  kova::host::ShareForSearch found;
  if (!kova::host::FindShareForSearch(share, found)) return std::nullopt;
  return ferrox::wire::IndexShare{share, found.root, found.refused, found.rules};
}

/// Rather than to index what was to be left out, nothing is indexed while the settings cannot be read.
ferrox::indexd::ShareFolders::InstancePatterns InstancePatterns() {
  ferrox::indexd::ShareFolders::InstancePatterns found;
  const std::string problem = kova::host::InstanceExclusions(found);
  if (!problem.empty()) throw ferrox::Error(ferrox::Error::kLoadFailed, problem);
  return found;
}

}  // namespace

int main(int argc, char** argv) try {
  (void)mallopt(M_ARENA_MAX, 2);  // each of many threads holds a document for a moment
  ferrox::indexd::IndexDaemon::Options options;
  const char* answer = nullptr;
  const bool understood = ParseArguments(argc, argv, options, answer);
  if (!understood || answer != nullptr) {
    (void)fputs(understood ? answer : kUsage, understood ? stdout : stderr);
    return understood ? 0 : 2;
  }
  ferrox::services::Daemon daemon("fileindexd");
  options.share_files = kova::host::FilesOfShares();
  options.on_share_change = &kova::host::ExpectSambaChange;
  options.describe_share = &DescribeShare;
  options.instance_patterns = &InstancePatterns;
  options.is_mount_point = &kova::host::IsMountRoot;
  options.mounts_below = &kova::host::MountsBelow;
  ferrox::indexd::IndexDaemon index_daemon(options);
  ferrox::services::FrameServerOptions server_options;
  server_options.socket_path = ferrox::InstancePath(ferrox::kFileIndexdSocket);
  server_options.workers = ferrox::indexd::IndexDaemon::kRequestThreads;
  server_options.on_stop = [&index_daemon] { index_daemon.EndSyncs(); };
  ferrox::services::FrameServer server(server_options,
                                       [&index_daemon](const std::string& request, const ferrox::services::Peer& peer) {
                                         return index_daemon.Handle(request, peer);
                                       });
  ferrox::services::AdmitEngine(server_options.socket_path);
  index_daemon.Start();
  daemon.NotifyReady();
  server.Run(daemon.StopFd());
  return 0;
} catch (const std::exception& error) {
  (void)fprintf(stderr, "fileindexd: %s\n", kova::WithoutControlCharacters(error.what()).c_str());
  return 3;
}
