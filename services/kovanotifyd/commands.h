#pragma once

#include <string>

#include "services/kovanotifyd/notifier.h"
#include "services/support/frame_server.h"

namespace ferrox::notifyd {

/// Answers one request of the command channel (docs/formats/notifyd.md); never throws. From any thread.
std::string HandleCommand(Notifier& notifier, const std::string& request, const services::Peer& peer);

}  // namespace ferrox::notifyd
