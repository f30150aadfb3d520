#pragma once

#include "base/unique_fd.h"

/// Here for programs that include this path: the class itself is base's.
namespace ferrox {

using base::UniqueFd;

}  // namespace ferrox
