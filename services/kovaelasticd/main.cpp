#include <malloc.h>
#include <unistd.h>

#include <cstdio>
#include <cstring>
#include <memory>
#include <optional>
#include <string>
#include <utility>

#include <kova/log.h>

#include "base/files.h"
#include "common/error.h"
#include "common/paths.h"
#include "platform/host/account_lookup.h"
#include "platform/host/synonyms.h"
#include "services/kovaelasticd/commands/caller.h"
#include "services/kovaelasticd/commands/engine.h"
#include "services/kovaelasticd/commands/live_look.h"
#include "services/kovaelasticd/commands/named_users.h"
#include "services/kovaelasticd/commands/synonyms_of_settings.h"
#include "services/kovaelasticd/commands/trust_of_settings.h"
#include "services/kovaelasticd/commands/user_limits.h"
#include "services/kovaelasticd/own_user.h"
#include "services/support/daemon.h"
#include "services/support/frame_server.h"
#include "services/support/instance_owner.h"

namespace {

constexpr char kHelp[] =
    "usage: kovaelasticd [--prepare USER | --help | --version]\n"
    "Keeps the search indices and answers requests on its socket, in the foreground, until SIGTERM or SIGINT.\n"
    "  --prepare USER   as root: gives the indices to USER, an account or a number; the engine runs as that user from\n"
    "                   then on\n"
    "FERROX_ROOT chooses the instance: a folder before every path of the product.\n";

/// Searches need a few MiB for a moment: without this, every one would ask the kernel for them and give them back.
void KeepMemoryForSearches() {
  (void)mallopt(M_ARENA_MAX, 4);
  (void)mallopt(M_MMAP_THRESHOLD, 8 << 20);
  (void)mallopt(M_TRIM_THRESHOLD, 16 << 20);
}

/// Who owns the instance may read its settings; for others kova-access does.
std::optional<ferrox::wire::SynonymAnswer> ReadSynonyms(const std::string& known) {
  if (ferrox::services::InstanceOwner() != geteuid()) return ferrox::engine::AskForSynonyms(known);
  const std::shared_ptr<const kova::host::SynonymList> list = kova::host::GetSynonyms();
  ferrox::wire::SynonymAnswer answer{list->stamp};
  if (list->stamp != known) answer.rules = list->rules;
  return answer;
}

void Serve() {
  using namespace ferrox;
  constexpr uint32_t kRequestMaxBytes = 256U << 20;
  constexpr unsigned kWorkers = 16;  // requests at a time: most wait for an index's thread or the disk
  engine::BecomeOwnUser();
  services::Daemon daemon("kovaelasticd");
  const std::string state_folder = InstancePath(kElasticdFolder);
  if (!base::MakeFolders(state_folder, 0700)) {
    throw Error(Error::kInternal, "cannot make the folder " + state_folder);
  }
  engine::TrustOfSettings trust;
  engine::SynonymsOfSettings synonyms(&ReadSynonyms);
  engine::Engine engine(state_folder, &engine::LookOnDisk,
                        {[&trust] { return trust.Get(); }, &kova::host::LookUpAccount},
                        [&synonyms] { return synonyms.Get(); });
  services::FrameServerOptions options;
  options.socket_path = engine::OwnSocketPath();
  options.socket_mode = engine.InstanceOwner() == 0 ? 0666 : 0660;  // else nobody but its owner is answered
  options.request_limit_bytes = kRequestMaxBytes;
  options.requests_limit_bytes = 2ULL * kRequestMaxBytes;
  options.workers = kWorkers;
  options.users =
      engine::LimitsOfUsers(engine.InstanceOwner(), [&engine](uint32_t uid) { return engine.IsTrusted(uid); });
  options.on_stop = [&engine] { engine.EndWaits(); };
  services::FrameServer server(options, [&engine](const std::string& request, const services::Peer& peer) {
    return engine.Handle(request, peer);
  });
  daemon.NotifyReady();
  server.Run(daemon.StopFd());
}

}  // namespace

int main(int argc, char** argv) {
  if (argc == 2 && strcmp(argv[1], "--help") == 0) return fputs(kHelp, stdout) < 0 ? 3 : 0;
  if (argc == 2 && strcmp(argv[1], "--version") == 0) return printf("kovaelasticd %s\n", ferrox::engine::kVersion) < 0;
  const bool prepares = argc == 3 && strcmp(argv[1], "--prepare") == 0;
  if (argc != 1 && !prepares) return fputs(kHelp, stderr) < 0 ? 3 : 2;
  try {
    if (prepares) {
      ferrox::engine::PrepareForUser(argv[2]);
      return 0;
    }
    KeepMemoryForSearches();
    Serve();
    return 0;
  } catch (const std::exception& error) {
    (void)fprintf(stderr, "kovaelasticd: %s\n", kova::WithoutControlCharacters(error.what()).c_str());
    return 3;
  }
}
