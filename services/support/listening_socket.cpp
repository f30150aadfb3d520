#include "services/support/listening_socket.h"

#include <sys/socket.h>
#include <sys/stat.h>
#include <sys/un.h>
#include <unistd.h>

#include <cerrno>
#include <cstring>
#include <vector>

#include "common/error.h"
#include "common/file_util.h"
#include "common/log.h"

namespace ferrox::services {

namespace {

sockaddr_un AddressOf(const std::string& path) {
  sockaddr_un address = {};
  address.sun_family = AF_UNIX;
  FERROX_FAIL_IF(path.size() >= sizeof(address.sun_path), Error::kInternal,
                 "socket path " + path + " is too long; choose a shorter root");
  memcpy(address.sun_path, path.c_str(), path.size() + 1);
  return address;
}

/// Removes the socket file of a process that has died. bind() refuses a path that exists, and no process removes its
/// socket when it is killed.
void RemoveStaleSocket(const std::string& path, const sockaddr_un& address) {
  const base::UniqueFd probe(socket(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC, 0));
  const bool served =
      connect(probe.Get(), reinterpret_cast<const sockaddr*>(&address), static_cast<socklen_t>(sizeof(address))) == 0;
  FERROX_FAIL_IF(served, Error::kInternal, path + " is served by another process; stop it first");
  struct stat status = {};
  if (lstat(path.c_str(), &status) == 0 && S_ISSOCK(status.st_mode)) (void)unlink(path.c_str());
}

/// The supplementary groups of the peer. The kernel says how many there are when the room is too small.
std::vector<gid_t> GroupsOf(int fd) {
  std::vector<gid_t> groups(64);
  auto size = static_cast<socklen_t>(groups.size() * sizeof(gid_t));
  int result = getsockopt(fd, SOL_SOCKET, SO_PEERGROUPS, groups.data(), &size);
  if (result != 0 && errno == ERANGE) {
    groups.resize(size / sizeof(gid_t));
    result = getsockopt(fd, SOL_SOCKET, SO_PEERGROUPS, groups.data(), &size);
  }
  groups.resize(result == 0 ? size / sizeof(gid_t) : 0);
  return groups;
}

}  // namespace

base::UniqueFd Listen(const std::string& path, mode_t mode) {
  const sockaddr_un address = AddressOf(path);
  RemoveStaleSocket(path, address);
  base::UniqueFd listener(socket(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC | SOCK_NONBLOCK, 0));
  FERROX_FAIL_IF(!listener.Valid(), Error::kInternal, "socket: " + ErrnoText());
  (void)fchmod(listener.Get(), mode);  // what bind gives the file; chmod makes it certain whatever the umask
  const bool listening =
      bind(listener.Get(), reinterpret_cast<const sockaddr*>(&address), static_cast<socklen_t>(sizeof(address))) == 0 &&
      chmod(path.c_str(), mode) == 0 && listen(listener.Get(), SOMAXCONN) == 0;
  FERROX_FAIL_IF(!listening, Error::kInternal, "cannot serve " + path + ": " + ErrnoText());
  return listener;
}

Peer PeerOf(int fd) {
  ucred credentials = {};
  socklen_t size = sizeof(credentials);
  if (getsockopt(fd, SOL_SOCKET, SO_PEERCRED, &credentials, &size) != 0) return {static_cast<uid_t>(-1)};
  return {credentials.uid, credentials.gid, credentials.pid, GroupsOf(fd)};
}

}  // namespace ferrox::services
