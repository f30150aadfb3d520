#pragma once

#include "base/scope_exit.h"

/// Here for programs that include this path: the class itself is base's.
namespace ferrox {

using base::ScopeExit;

}  // namespace ferrox
