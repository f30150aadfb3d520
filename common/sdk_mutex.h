#pragma once

#include "common/export.h"
#include "common/mutex.h"

namespace ferrox::sdk {

/// The process's one mutex around the platform's share, user and credential calls, which are not safe for concurrent
/// use. Not recursive: what holds it must not call anything that takes it.
FERROX_EXPORT Mutex& SDKMutex();

}  // namespace ferrox::sdk
