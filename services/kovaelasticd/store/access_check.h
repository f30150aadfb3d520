#pragma once

#include <cstdint>

#include "base/access_record.h"
#include "services/kovaelasticd/store/asker.h"

namespace ferrox::engine {

inline constexpr uint8_t kMayRead = 4;   ///< open for reading: a file, or a folder's list
inline constexpr uint8_t kMayEnter = 1;  ///< reach what is in a folder

/// Which of kMayRead and kMayEnter a file or folder with this record gives the asker, each asked for by itself, as the
/// kernel decides (acl_permission_check, posix_acl_permission). Capabilities of the asker count for nothing: uid 0 gets
/// what the record says of uid 0.
uint8_t PermissionsOf(const base::AccessRecord& record, const Asker& asker);

}  // namespace ferrox::engine
