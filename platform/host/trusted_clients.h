#pragma once

#include <sys/types.h>

#include <cstdint>
#include <vector>

namespace kova::host {

/// Whose programs may search for other users ("trusted_clients" of the settings).
struct TrustedClients {
  std::vector<uid_t> uids = {};
  uint32_t least_user = 1000;  ///< for no user with a smaller uid
};

/// Those of now: reads /etc/passwd where the settings name any. They are accounts of that file: nobody on the network
/// is waited for, or can become one. A name without such an account is logged; settings with a mistake name nobody. Any
/// thread may call.
TrustedClients GetTrustedClients();

}  // namespace kova::host
