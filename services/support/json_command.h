#pragma once

#include <functional>
#include <string>

#include <json/value.h>

#include "services/support/frame_server.h"

namespace ferrox::services {

/// Carries one command out and returns the "data" of its reply. An Error becomes a reply that says so.
using JsonCommand = std::function<Json::Value(const std::string& type, const Json::Value& data)>;

/// Root, and the user that this process runs as: the owner of an instance that is not root's.
bool IsRootOrOwner(const Peer& peer);

/// Runs on the calling thread for as long as the command does.
/// Answers a request of the form that docs/formats/daemon.md describes; never throws. Only those are obeyed for whom
/// `is_obeyed` holds.
std::string AnswerJsonCommand(const std::string& request, const Peer& peer, const JsonCommand& command,
                              bool (*is_obeyed)(const Peer& peer) = &IsRootOrOwner);

}  // namespace ferrox::services
