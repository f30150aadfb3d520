#pragma once

#include <string>
#include <vector>

#include "base/unique_fd.h"

namespace ferrox::web {

/// A socket that listens.
struct Listener {
  base::UniqueFd fd;
  bool is_local = false;     ///< a Unix socket, whose peers the kernel names
  std::string address = {};  ///< "127.0.0.1:9280", or the socket's path
};

/// Those that the service manager passes (LISTEN_FDS, sd_listen_fds(3)) where it passes any; else the Unix socket of
/// this instance, and one for each of `addresses`.
/// @throws Error kInternal with a sentence: an address cannot be read or had.
std::vector<Listener> OpenListeners(const std::vector<std::string>& addresses);

}  // namespace ferrox::web
