#include "services/kovawebd/listener.h"

#include <arpa/inet.h>
#include <fcntl.h>
#include <netinet/in.h>
#include <sys/socket.h>
#include <unistd.h>

#include <cerrno>
#include <charconv>
#include <cstdlib>
#include <cstring>
#include <optional>

#include "base/files.h"
#include "common/error.h"
#include "common/log.h"
#include "common/paths.h"
#include "services/support/instance_owner.h"
#include "services/support/listening_socket.h"
#include "services/support/web_user.h"

namespace ferrox::web {

namespace {

struct NetAddress {
  sockaddr_storage storage = {};
  socklen_t size = 0;

  const sockaddr* Get() const { return reinterpret_cast<const sockaddr*>(&storage); }
};

/// "1.2.3.4:80", "[::1]:80"; no names, which would have to be looked up.
std::optional<NetAddress> ReadNetAddress(const std::string& text) {
  const size_t colon = text.rfind(':');
  if (colon == std::string::npos) return std::nullopt;
  std::string host = text.substr(0, colon);
  uint16_t port = 0;
  const char* end = text.data() + text.size();
  const auto read = std::from_chars(text.data() + colon + 1, end, port);
  if (read.ec != std::errc() || read.ptr != end) return std::nullopt;
  NetAddress address;
  if (host.size() > 2 && host.front() == '[' && host.back() == ']') {
    auto* six = reinterpret_cast<sockaddr_in6*>(&address.storage);
    six->sin6_family = AF_INET6;
    six->sin6_port = htons(port);
    address.size = sizeof(*six);
    host = host.substr(1, host.size() - 2);
    return inet_pton(AF_INET6, host.c_str(), &six->sin6_addr) == 1 ? std::optional(address) : std::nullopt;
  }
  auto* four = reinterpret_cast<sockaddr_in*>(&address.storage);
  four->sin_family = AF_INET;
  four->sin_port = htons(port);
  address.size = sizeof(*four);
  return inet_pton(AF_INET, host.c_str(), &four->sin_addr) == 1 ? std::optional(address) : std::nullopt;
}

std::string TextOf(const sockaddr_storage& address) {
  char text[INET6_ADDRSTRLEN] = {};
  if (address.ss_family == AF_INET6) {
    const auto* six = reinterpret_cast<const sockaddr_in6*>(&address);
    (void)inet_ntop(AF_INET6, &six->sin6_addr, text, sizeof(text));
    return "[" + std::string(text) + "]:" + std::to_string(ntohs(six->sin6_port));
  }
  const auto* four = reinterpret_cast<const sockaddr_in*>(&address);
  (void)inet_ntop(AF_INET, &four->sin_addr, text, sizeof(text));
  return std::string(text) + ":" + std::to_string(ntohs(four->sin_port));
}

/// Of a socket that is bound. Of another family than these: not one that is listened on.
std::optional<Listener> Describe(base::UniqueFd fd) {
  NetAddress address;
  address.size = sizeof(address.storage);
  if (getsockname(fd.Get(), reinterpret_cast<sockaddr*>(&address.storage), &address.size) != 0) return std::nullopt;
  const bool is_local = address.storage.ss_family == AF_UNIX;
  if (!is_local && address.storage.ss_family != AF_INET && address.storage.ss_family != AF_INET6) return std::nullopt;
  std::string text = is_local ? InstancePath(services::kWebSocket) : TextOf(address.storage);
  return Listener{std::move(fd), is_local, std::move(text)};
}

/// sd_listen_fds(3): the descriptors from 3 on, for the process of this number alone.
std::vector<Listener> PassedListeners() {
  constexpr int kFirst = 3, kMax = 64;
  const char* pid = getenv("LISTEN_PID");
  const char* count = getenv("LISTEN_FDS");
  std::vector<Listener> listeners;
  if (pid == nullptr || count == nullptr || atol(pid) != getpid()) return listeners;
  for (int fd = kFirst; fd < kFirst + std::min(atoi(count), kMax); ++fd) {
    (void)fcntl(fd, F_SETFD, FD_CLOEXEC);
    (void)fcntl(fd, F_SETFL, fcntl(fd, F_GETFL) | O_NONBLOCK);
    std::optional<Listener> listener = Describe(base::UniqueFd(fd));
    FERROX_FAIL_IF(!listener.has_value(), Error::kInternal, "the service manager passed what is no listening socket");
    listeners.push_back(std::move(*listener));
  }
  return listeners;
}

Listener ListenOnNet(const std::string& text) {
  const std::optional<NetAddress> address = ReadNetAddress(text);
  FERROX_FAIL_IF(!address.has_value(), Error::kInternal,
                 "\"" + text + "\" of \"addresses\" in the settings is no address as 127.0.0.1:9280 or [::1]:9280");
  base::UniqueFd fd(socket(address->Get()->sa_family, SOCK_STREAM | SOCK_CLOEXEC | SOCK_NONBLOCK, 0));
  const int on = 1;
  (void)setsockopt(fd.Get(), SOL_SOCKET, SO_REUSEADDR, &on, sizeof(on));
  if (address->Get()->sa_family == AF_INET6) (void)setsockopt(fd.Get(), IPPROTO_IPV6, IPV6_V6ONLY, &on, sizeof(on));
  const bool listens =
      fd.Valid() && bind(fd.Get(), address->Get(), address->size) == 0 && listen(fd.Get(), SOMAXCONN) == 0;
  FERROX_FAIL_IF(!listens, Error::kInternal,
                 "cannot listen on " + text + ": " + ErrnoText() + "; \"addresses\" in the settings names others");
  return std::move(*Describe(std::move(fd)));
}

}  // namespace

std::vector<Listener> OpenListeners(const std::vector<std::string>& addresses) {
  std::vector<Listener> listeners = PassedListeners();
  if (!listeners.empty()) return listeners;
  const std::string path = InstancePath(services::kWebSocket);
  FERROX_FAIL_IF(!base::MakeFolders(InstancePath(services::kWebRunFolder)), Error::kInternal,
                 "cannot make " + InstancePath(services::kWebRunFolder) + ": " + ErrnoText());
  // Whoever connects is asked for as the user whom the kernel names; another's instance serves its owner alone.
  const mode_t mode = services::IsRootsInstance() ? 0666 : 0600;
  listeners.push_back({services::Listen(path, mode), true, path});
  for (const std::string& address : addresses) listeners.push_back(ListenOnNet(address));
  return listeners;
}

}  // namespace ferrox::web
