#pragma once

/// The installed path of this header, which stays; the declarations are in the room of their module.
#include "fileindex/queue/queue_mgr.h"
