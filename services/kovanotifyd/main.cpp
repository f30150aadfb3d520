#include <getopt.h>
#include <malloc.h>

#include <cstdio>
#include <exception>
#include <thread>

#include <kova/log.h>

#include "base/scope_exit.h"
#include "common/paths.h"
#include "platform/host/configuration.h"
#include "platform/host/notify_registry.h"
#include "services/kovanotifyd/commands.h"
#include "services/kovanotifyd/notifier.h"
#include "services/kovanotifyd/ways.h"
#include "services/support/daemon.h"
#include "services/support/engine_user.h"

namespace {

constexpr char kUsage[] =
    "Usage: kovanotifyd\n"
    "Watches the registered folders and writes what changes there into the queues of those who registered them.\n"
    "  --help        this text\n"
    "  --version     the version\n"
    "The environment variable FERROX_ROOT chooses the instance.\n";

/// False when the arguments cannot be understood. `answer` is what is only to be printed.
bool ParseArguments(int argc, char** argv, const char*& answer) {
  const option known[] = {{"help", no_argument, nullptr, 'h'}, {"version", no_argument, nullptr, 'v'}, {}};
  for (int letter = 0; (letter = getopt_long(argc, argv, "", known, nullptr)) != -1;) {
    if (letter == '?') return false;
    answer = letter == 'h' ? kUsage : "kovanotifyd " FERROX_VERSION "\n";
  }
  return optind == argc;
}

ferrox::notifyd::Registry ReadHostRegistry() {
  kova::host::Registrations read = kova::host::ReadRegistrations();
  ferrox::notifyd::Registry registry;
  registry.problems = std::move(read.problems);
  for (kova::host::Registration& entry : read.list) {
    ferrox::notifyd::Registration registration = {std::move(entry.application), std::move(entry.queue)};
    for (kova::host::Watch& watch : entry.watches) {
      registration.watches.push_back({std::move(watch.path), watch.mask, std::move(watch.ignore)});
    }
    registry.list.push_back(std::move(registration));
  }
  return registry;
}

ferrox::notifyd::Notifier::Options HostOptions() {
  const auto configuration = kova::host::GetConfiguration();
  ferrox::notifyd::Notifier::Options options;
  options.registry_folder = kova::host::RegistryFolder();
  options.read_registry = &ReadHostRegistry;
  options.scan_interval = std::chrono::seconds(configuration->notifyd.scan_interval_sec);
  options.own_paths = ferrox::notifyd::OwnPaths();
  ferrox::notifyd::ChooseWays(configuration->notifyd.watch, options);
  return options;
}

}  // namespace

int main(int argc, char** argv) try {
  const char* answer = nullptr;
  const bool understood = ParseArguments(argc, argv, answer);
  if (!understood || answer != nullptr) {
    (void)fputs(understood ? answer : kUsage, understood ? stdout : stderr);
    return understood ? 0 : 2;
  }
  (void)mallopt(M_ARENA_MAX, 1);  // the threads that answer requests need no memory of their own
  ferrox::services::Daemon daemon("kovanotifyd");
  ferrox::notifyd::Notifier notifier(HostOptions());
  ferrox::services::FrameServerOptions server_options;
  server_options.socket_path = ferrox::InstancePath(ferrox::kNotifydSocket);
  server_options.workers = 8;  // each may wait for a sync
  ferrox::services::FrameServer server(server_options,
                                       [&notifier](const std::string& request, const ferrox::services::Peer& peer) {
                                         return ferrox::notifyd::HandleCommand(notifier, request, peer);
                                       });
  ferrox::services::AdmitEngine(server_options.socket_path);
  std::thread server_thread([&] { server.Run(daemon.StopFd()); });
  const base::ScopeExit stop([&] {
    server.Stop();
    server_thread.join();
  });
  daemon.NotifyReady();
  notifier.Run(daemon.StopFd());
  return 0;
} catch (const std::exception& error) {
  (void)fprintf(stderr, "kovanotifyd: %s\n", kova::WithoutControlCharacters(error.what()).c_str());
  return 3;
}
