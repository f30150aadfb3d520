#pragma once

#include <string>

#include "base/unique_fd.h"

namespace base {

/// Opens the file at `path` for reading, which must lie below the folder `root` and be reached from there without any
/// link, whatever is swapped in meanwhile; without waiting for a writer of a FIFO, and without touching the time of
/// last access where that is allowed. Not valid, with errno, when that cannot be: ELOOP or EXDEV for a link, EINVAL for
/// a path that is not below the root.
/// @param may_ask_kernel false: walk from folder to folder, as on kernels that cannot do it in one call
UniqueFd OpenBeneath(const std::string& root, const std::string& path, bool may_ask_kernel = true);

}  // namespace base
