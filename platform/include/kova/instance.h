#pragma once

#include <stdlib.h>

#include <string>

namespace kova {

/// The folder that this instance's fixed paths lie under: the value of FERROX_ROOT, without trailing slashes; empty for
/// the one instance of the host itself. With a root, several instances run beside each other on one host, each with its
/// own daemons, shares, indices and locks, and by users without privileges. Read once, at the first call; ignored in a
/// program with raised privileges. Lives until the process ends.
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
