#pragma once

#include <string>

#include "services/kovanotifyd/notifier.h"
#include "services/support/frame_server.h"

namespace ferrox::notifyd {

/// Answers one request of the command channel (docs/formats/notifyd.md): parses it, has the notifier carry it out, and
/// returns the reply or the failure as JSON text. Never throws. From any thread except the notifier's; a sync blocks
/// the caller until it is answered.
std::string HandleCommand(Notifier& notifier, const std::string& request, const services::Peer& peer);

}  // namespace ferrox::notifyd
