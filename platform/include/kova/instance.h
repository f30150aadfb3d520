#pragma once

#include <stdlib.h>

#include <string>

namespace kova {

/// The folder that this instance's fixed paths lie under: the value of FERROX_ROOT, without trailing slashes; empty for
/// the one instance of the host itself. With a root, several instances run beside each other on one host, each with its
/// own daemons, shares, indices and locks, and by users without privileges. Read once, at the first call; ignored in a
/// program with raised privileges. Lives until the process ends.
/// A fixed path is put behind it: with FERROX_ROOT=/home/ann/index/ the socket "/var/run/fileindexd.sock" lies at
/// "/home/ann/index/var/run/fileindexd.sock". Whether the value is usable (absolute, short enough for sockets) is not
/// checked here; programs ask ferrox::InstanceRootProblem (common/paths.h) when they start. Any thread may call it; a
/// later change of the environment changes nothing.
inline const std::string& InstanceRoot() {
  static const std::string root = [] {
    const char* value = secure_getenv("FERROX_ROOT");
    std::string text = value != nullptr ? value : "";
    while (!text.empty() && text.back() == '/') text.pop_back();
    return text;
  }();
  return root;
}

}  // namespace kova
