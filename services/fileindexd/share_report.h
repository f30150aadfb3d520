#pragma once

#include <json/value.h>

#include "services/fileindexd/share_context.h"

namespace ferrox::indexd {

/// The share's object in the answer to "status" (docs/formats/daemon.md), without the engine's figures. Reads the
/// queue's files and the mounts, and waits for nothing. From any thread.
Json::Value ReportShare(const ShareContext& context);

}  // namespace ferrox::indexd
