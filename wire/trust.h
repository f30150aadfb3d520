#pragma once

#include <chrono>
#include <cstdint>
#include <optional>
#include <vector>

/// Whose programs may search for other users ("trusted_clients" and "least_user" of the settings), and for whom they
/// may not; and how much memory searches may have. The settings, and when accounts end, are root's alone to read; the
/// search engine asks `kova-access`, which may read them (docs/formats/access.md).
namespace ferrox::wire {

struct Trust {
  std::vector<uint32_t> clients = {};  ///< their uids
  uint32_t least_user = 1000;          ///< for no user with a smaller uid
  std::vector<uint32_t> ended = {};    ///< nor for these: local accounts that have expired
  uint32_t memory_mib = 0;             ///< for the long lists of searches; 0: the settings do not say
};

/// Blocks at most `longest` for each wait, of which there are few. Nothing when it cannot be told.
std::optional<Trust> AskTrust(std::chrono::milliseconds longest);

}  // namespace ferrox::wire
