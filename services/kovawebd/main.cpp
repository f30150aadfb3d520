#include <malloc.h>
#include <poll.h>

#include <cerrno>
#include <cstdio>
#include <cstring>
#include <exception>
#include <memory>
#include <utility>
#include <vector>

#include <kova/log.h>

#include "platform/host/configuration.h"
#include "services/kovawebd/http_server.h"
#include "services/kovawebd/listener.h"
#include "services/kovawebd/service.h"
#include "services/kovawebd/settings.h"
#include "services/kovawebd/tokens.h"
#include "services/support/daemon.h"

namespace {

using namespace ferrox;

constexpr char kHelp[] =
    "usage: kovawebd [--prepare USER | --help | --version]\n"
    "Answers searches by HTTP, for the user who asks, in the foreground, until SIGTERM or SIGINT.\n"
    "  --prepare USER   as root: makes USER, an account or a number, the daemon's user from then on\n"
    "FERROX_ROOT chooses the instance: a folder before every path of the product.\n";

/// Of settings with a mistake, which is logged, what could be read: the daemon answers on its Unix socket all the same.
web::Settings ReadSettings() {
  const std::shared_ptr<const kova::host::Configuration> settings = kova::host::GetConfiguration();
  return {settings->web.addresses, settings->web.hosts};
}

void Serve() {
  const web::Settings settings = web::BecomeOwnUser(&ReadSettings);
  services::Daemon daemon("kovawebd");
  std::vector<web::Listener> listeners = web::OpenListeners(settings.addresses);
  web::Service::Options options{settings.hosts, {}};
  for (const web::Listener& listener : listeners) {
    if (!listener.is_local) options.addresses.push_back(listener.address);
  }
  web::Tokens tokens(web::TokensPath());
  web::Service service(std::move(options), tokens);
  const web::HttpServer server(std::move(listeners),
                               [&service](const web::Request& request) { return service.Handle(request); });
  daemon.NotifyReady();
  pollfd stop = {daemon.StopFd(), POLLIN, 0};
  while (poll(&stop, 1, -1) < 0 && errno == EINTR) continue;
  service.Cancel();
}

}  // namespace

int main(int argc, char** argv) {
  if (argc == 2 && strcmp(argv[1], "--help") == 0) return fputs(kHelp, stdout) < 0 ? 3 : 0;
  if (argc == 2 && strcmp(argv[1], "--version") == 0) return printf("kovawebd %s\n", FERROX_VERSION) < 0;
  const bool prepares = argc == 3 && strcmp(argv[1], "--prepare") == 0;
  if (argc != 1 && !prepares) return fputs(kHelp, stderr) < 0 ? 3 : 2;
  try {
    (void)mallopt(M_ARENA_MAX, 2);
    prepares ? web::PrepareForUser(argv[2], ReadSettings()) : Serve();
    return 0;
  } catch (const std::exception& error) {
    (void)fprintf(stderr, "kovawebd: %s\n", kova::WithoutControlCharacters(error.what()).c_str());
    return 3;
  }
}
