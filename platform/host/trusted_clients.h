#pragma once

#include <sys/types.h>

#include <cstdint>
#include <optional>
#include <vector>

namespace kova::host {

/// Whose programs may search for other users ("trusted_clients" of the settings).
struct TrustedClients {
  std::vector<uid_t> uids = {};
  uint32_t least_user = 1000;  ///< for no user with a smaller uid
  /// Nor for these: accounts of /etc/passwd that have expired, by /etc/shadow as far as this process may read it. None
  /// where nobody is trusted.
  std::vector<uid_t> ended = {};
  uint32_t memory_mib = 0;  ///< what searches may hold in long lists ("engine"); 0: the settings do not say
};

/// Those of now, and `own_client`, a daemon of the product's own, where there is one: reads those files where there are
/// any. Those that the settings name are accounts of that file: nobody on the network
/// is waited for, or can become one. A name without such an account is logged; settings with a mistake name nobody. Any
/// thread may call.
TrustedClients GetTrustedClients(std::optional<uid_t> own_client);

}  // namespace kova::host
