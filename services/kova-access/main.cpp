#include <malloc.h>

#include <cstdio>
#include <cstring>
#include <exception>
#include <memory>
#include <optional>
#include <string>
#include <utility>

#include <kova/log.h>

#include "common/paths.h"
#include "platform/host/synonyms.h"
#include "platform/host/trusted_clients.h"
#include "services/kova-access/access_server.h"
#include "services/support/daemon.h"
#include "services/support/engine_user.h"
#include "services/support/frame_server.h"
#include "services/support/web_user.h"

namespace {

using namespace ferrox;

constexpr char kHelp[] =
    "usage: kova-access [--help | --version]\n"
    "Tells the search engine which files a user may open now, by trying it with the ids of that user, in the\n"
    "foreground, until SIGTERM or SIGINT. FERROX_ROOT chooses the instance.\n";

/// Requests that open files at a time, and of these below one share's folder, which are as many as the engine can send:
/// two file systems that do not answer leave room for others.
constexpr unsigned kAtOnce = 40, kRootAtOnce = 16;
/// For the questions about the daemon's state, which come while all others hang.
constexpr unsigned kSpareThreads = 2;
/// A client puts at most 1 MiB of paths into a request; JSON may write six bytes for one.
constexpr uint32_t kRequestMaxBytes = 8U << 20;
constexpr unsigned kConnectionsMax = 64;

wire::Trust ReadTrust() {
  const std::optional<services::EngineIds> web = services::WebUser();
  kova::host::TrustedClients clients =
      kova::host::GetTrustedClients(web.has_value() ? std::optional(web->uid) : std::nullopt);
  return {std::move(clients.uids), clients.least_user, std::move(clients.ended), clients.memory_mib};
}

wire::SynonymAnswer ReadSynonyms(const std::string& known) {
  const std::shared_ptr<const kova::host::SynonymList> list = kova::host::GetSynonyms();
  return {list->stamp, list->stamp == known ? std::nullopt : std::optional(list->rules)};
}

void Serve() {
  services::Daemon daemon("kova-access");
  services::OpenLimit::Options limit;
  limit.at_once = kAtOnce;
  limit.root_at_once = kRootAtOnce;
  access::AccessServer access_server(limit, &ReadTrust, &ReadSynonyms);
  services::FrameServerOptions options;
  options.socket_path = InstancePath(kAccessSocket);
  options.request_limit_bytes = kRequestMaxBytes;
  options.requests_limit_bytes = 4ULL * kRequestMaxBytes;
  options.connections_max = kConnectionsMax;
  options.workers = kAtOnce + kSpareThreads;
  services::FrameServer server(options, [&](const std::string& request, const services::Peer& peer) {
    return access_server.Handle(request, peer);
  });
  services::AdmitEngine(options.socket_path);
  daemon.NotifyReady();
  server.Run(daemon.StopFd());
}

}  // namespace

int main(int argc, char** argv) {
  if (argc == 2 && strcmp(argv[1], "--help") == 0) return fputs(kHelp, stdout) < 0 ? 3 : 0;
  if (argc == 2 && strcmp(argv[1], "--version") == 0) return printf("kova-access %s\n", FERROX_VERSION) < 0;
  if (argc != 1) return fputs(kHelp, stderr) < 0 ? 3 : 2;
  try {
    (void)mallopt(M_ARENA_MAX, 2);  // each request has a thread of its own for a moment
    Serve();
    return 0;
  } catch (const std::exception& error) {
    (void)fprintf(stderr, "kova-access: %s\n", kova::WithoutControlCharacters(error.what()).c_str());
    return 3;
  }
}
