#pragma once

#include "common/export.h"
#include "common/mutex.h"

namespace ferrox::sdk {

/// The process's one mutex around the platform's share, user and credential calls, which are not safe for concurrent
/// use. Not recursive: what holds it must not call anything that takes it. It is held while the platform asks files and
/// the host's user database; never wait for another thread under it.
FERROX_EXPORT Mutex& SDKMutex();

}  // namespace ferrox::sdk
